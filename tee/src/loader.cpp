// SPDX-License-Identifier: BSD-2-Clause
#include "loader.h"

#include <dlfcn.h>
#include <tee_test.h>

#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <map>
#include <mutex>
#include <span>
#include <string_view>

#include "error.h"
#include "loaded_image.h"

namespace tee {

namespace fs = std::filesystem;

namespace {

std::mutex g_lock;  // of what is below, and of "is it loaded? then load"
std::string g_test_directory;

Error bad_image(const std::string &file, const std::string &why) {
  return {TEE_ERROR_BAD_FORMAT, "TA image " + file + ": " + why};
}

// ---- Finding

// Where this library was loaded from; empty when it is unknown.
fs::path own_path() {
  Dl_info library;
  if (::dladdr(reinterpret_cast<const void *>(&load_program), &library) == 0) return {};
  std::error_code error;
  const fs::path path = fs::canonical(library.dli_fname, error);
  return error ? fs::path() : path;
}

// Beside the program and beside this library. Neither moves while the process runs; to ask the
// system each time would take a fifth of the time that loading takes.
std::vector<std::string> installed_folders() {
  std::vector<std::string> folders;
  std::error_code error;
  const fs::path program = fs::read_symlink("/proc/self/exe", error);
  if (!error) folders.push_back(program.parent_path().parent_path() / "ta");
  const fs::path library = own_path();
  if (!library.empty()) folders.push_back(library.parent_path() / "otrp" / "ta");
  return folders;
}

// Valid as long as the lock is held.
std::vector<std::string_view> search_path() {
  static const std::vector<std::string> installed = installed_folders();
  std::vector<std::string_view> folders;
  folders.reserve(installed.size() + 2);
  if (!g_test_directory.empty()) folders.emplace_back(g_test_directory);
  folders.insert(folders.end(), installed.begin(), installed.end());
  if (const char *folder = std::getenv("OTRP_TA_DIR"); folder != nullptr && *folder != '\0') {
    folders.emplace_back(folder);
  }
  return folders;
}

// The file, and what the system says of it.
std::string find_image(const TEE_UUID &ta, struct stat &status) {
  const std::string name = uuid_text(ta) + ".so";
  std::string file;
  for (const std::string_view folder : search_path()) {
    file.assign(folder).append(1, '/').append(name);
    if (::stat(file.c_str(), &status) == 0) return file;
  }
  std::string looked;
  for (const std::string_view folder : search_path()) {
    looked.append(looked.empty() ? " in " : ", ").append(folder);
  }
  throw Error{TEE_ERROR_ITEM_NOT_FOUND, "no TA image " + name + looked};
}

// ---- Images that no instance uses

// Loading takes longer than most commands. So one image of each file, as it was when it had just
// been loaded, waits here for the next instance. Never destroyed: the last instance may end with a
// static object.
using IdleImages = std::map<std::string, std::unique_ptr<LoadedImage>>;  // by file
IdleImages &idle_images() {
  static IdleImages *const images = new IdleImages;
  return *images;
}

std::unique_ptr<LoadedImage> take_or_load(const std::string &file, const struct stat &status) {
  std::unique_ptr<LoadedImage> idle = std::move(idle_images()[file]);
  if (idle && idle->is_of(status)) return idle;
  idle.reset();
  return LoadedImage::load(file);
}

// Without a word of what an instance has left in it.
void give_back(LoadedImage *used) {
  std::unique_ptr<LoadedImage> image(used);
  const std::lock_guard guard(g_lock);
  std::unique_ptr<LoadedImage> &idle = idle_images()[image->file()];
  if (image->reset() && !idle) idle = std::move(image);
}

// ---- Checking

const tee_ta_image &checked_header(const LoadedImage &image, const TEE_UUID &ta,
                                   const std::string &file) {
  const auto *header = static_cast<const tee_ta_image *>(image.header());
  if (header == nullptr) throw bad_image(file, "has no " TEE_TA_IMAGE_SYMBOL);
  if (header->magic != TEE_TA_IMAGE_MAGIC || header->version != TEE_TA_IMAGE_VERSION) {
    throw bad_image(file, "header of another kind or version");
  }
  if (uuid_bytes(header->uuid) != uuid_bytes(ta)) {
    throw bad_image(file, "is the image of " + uuid_text(header->uuid));
  }
  const tee_ta_entry_points &entry = header->entry_points;
  if (header->metadata == nullptr || header->metadata->trace_prefix == nullptr ||
      entry.create == nullptr || entry.destroy == nullptr || entry.open_session == nullptr ||
      entry.close_session == nullptr || entry.invoke_command == nullptr) {
    throw bad_image(file, "incomplete header");
  }
  return *header;
}

const tee_property &property(const tee_ta_metadata &metadata, const char *name,
                             tee_property_type type, const std::string &file) {
  for (const tee_property &known : std::span(
           metadata.properties, metadata.properties != nullptr ? metadata.num_properties : 0)) {
    if (std::strcmp(known.name, name) == 0 && known.type == type) return known;
  }
  throw bad_image(file, std::string("has no property ") + name);
}

void check_lifecycle(const tee_ta_metadata &metadata, const std::string &file) {
  const auto flag = [&](const char *name) {
    return property(metadata, name, TEE_PROPERTY_BOOL, file).value.boolean;
  };
  if (!flag("gpd.ta.singleInstance") || !flag("gpd.ta.multiSession") ||
      flag("gpd.ta.instanceKeepAlive")) {
    throw Error{
        TEE_ERROR_NOT_SUPPORTED,
        "TA image " + file + ": only single instance, multi session, no keep-alive can run here"};
  }
}

}  // namespace

Program load_program(const TEE_UUID &ta) {
  std::unique_lock guard(g_lock);
  struct stat status;
  const std::string file = find_image(ta, status);
  std::unique_ptr<LoadedImage> image = take_or_load(file, status);
  guard.unlock();
  const tee_ta_image &header = checked_header(*image, ta, file);
  check_lifecycle(*header.metadata, file);
  return {
      .uuid = ta,
      .data_size = property(*header.metadata, "gpd.ta.dataSize", TEE_PROPERTY_U32, file).value.u32,
      .trace_prefix = header.metadata->trace_prefix,
      .trace_level = header.metadata->trace_level,
      .entry_points = header.entry_points,
      .image = std::shared_ptr<LoadedImage>(image.release(), give_back),
  };
}

void test::set_ta_directory(const std::string &directory) {
  const std::lock_guard guard(g_lock);
  g_test_directory = directory;
}

}  // namespace tee
