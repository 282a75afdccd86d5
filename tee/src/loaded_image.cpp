// SPDX-License-Identifier: BSD-2-Clause
#include "loaded_image.h"

#include <dlfcn.h>
#include <link.h>
#include <tee_ta_image.h>
#include <unistd.h>

#include <algorithm>
#include <filesystem>
#include <span>

#include "error.h"

namespace tee {

namespace fs = std::filesystem;

namespace {

bool is_loaded(const std::string &file) {
  void *handle = ::dlopen(file.c_str(), RTLD_NOW | RTLD_LOCAL | RTLD_NOLOAD);
  if (handle != nullptr) ::dlclose(handle);
  return handle != nullptr;
}

host::File copy_of(const std::string &file, const host::File &source) {
  host::File copy = host::copy_in_memory(fs::path(file).filename().c_str(), source);
  if (!copy.valid()) throw system_error("cannot copy " + file);
  return copy;
}

bool is_same_file(const struct stat &one, const struct stat &other) {
  return one.st_dev == other.st_dev && one.st_ino == other.st_ino;
}

bool is_same_time(const timespec &one, const timespec &other) {
  return one.tv_sec == other.tv_sec && one.tv_nsec == other.tv_nsec;
}

bool is_same_content(const struct stat &one, const struct stat &other) {
  return one.st_size == other.st_size && is_same_time(one.st_mtim, other.st_mtim);
}

struct Segments {
  uintptr_t base;
  std::span<const ElfW(Phdr)> headers = {};
};

Segments segments_of(void *handle) {
  link_map *map = nullptr;
  ::dlinfo(handle, RTLD_DI_LINKMAP, &map);
  Segments segments = {map->l_addr};
  const auto find = [](dl_phdr_info *info, size_t, void *found) {
    auto &wanted = *static_cast<Segments *>(found);
    if (info->dlpi_addr != wanted.base) return 0;
    wanted.headers = {info->dlpi_phdr, info->dlpi_phnum};
    return 1;
  };
  ::dl_iterate_phdr(find, &segments);
  return segments;
}

// Where the pages end that the dynamic linker has written and then closed.
uintptr_t end_of_closed_pages(const Segments &segments) {
  const auto closed =
      std::ranges::find(segments.headers, ElfW(Word){PT_GNU_RELRO}, &ElfW(Phdr)::p_type);
  if (closed == segments.headers.end()) return 0;
  const auto page_len = static_cast<uintptr_t>(::sysconf(_SC_PAGESIZE));
  return (segments.base + closed->p_vaddr + closed->p_memsz) / page_len * page_len;
}

// A sanitizer takes the gaps that it leaves between variables for nobody's.
__attribute__((no_sanitize("address"))) void copy(const volatile uint8_t *from, size_t len,
                                                  volatile uint8_t *to) {
  for (size_t i = 0; i < len; ++i) to[i] = from[i];
}

}  // namespace

std::unique_ptr<LoadedImage> LoadedImage::load(const std::string &file) {
  std::unique_ptr<LoadedImage> image(new LoadedImage(file));
  image->open();
  image->remember_variables();
  return image;
}

LoadedImage::LoadedImage(const std::string &file) : file_(file) {}

// Unloading runs code of the image. Where the file was written over, so was that code.
LoadedImage::~LoadedImage() {
  if (handle_ != nullptr && is_intact()) ::dlclose(handle_);
}

// The dynamic linker takes an object of the same name for the same. A copy in memory has a name
// that no other one has while it is open.
void LoadedImage::open() {
  source_ = host::open_for_reading(file_.c_str());
  if (!source_.valid() || ::fstat(source_.get(), &status_) != 0) {
    throw system_error("cannot read " + file_);
  }
  std::string name = file_;
  if (is_loaded(file_)) {
    copy_ = copy_of(file_, source_);
    name = "/proc/self/fd/" + std::to_string(copy_.get());
  }
  handle_ = ::dlopen(name.c_str(), RTLD_NOW | RTLD_LOCAL);
  if (handle_ == nullptr) {
    throw Error{TEE_ERROR_BAD_FORMAT, "TA image " + file_ + ": " + ::dlerror()};
  }
  header_ = ::dlsym(handle_, TEE_TA_IMAGE_SYMBOL);
}

void LoadedImage::remember_variables() {
  const Segments segments = segments_of(handle_);
  const uintptr_t closed = end_of_closed_pages(segments);
  for (const ElfW(Phdr) & header : segments.headers) {
    if (header.p_type == PT_TLS) has_other_variables_ = true;
    if (header.p_type != PT_LOAD || (header.p_flags & PF_W) == 0) continue;
    const uintptr_t begin = std::max(segments.base + header.p_vaddr, closed);
    const uintptr_t end = segments.base + header.p_vaddr + header.p_memsz;
    if (begin >= end) continue;
    auto *at = reinterpret_cast<volatile uint8_t *>(begin);
    std::vector<uint8_t> initial(end - begin);
    copy(at, initial.size(), initial.data());
    variables_.push_back({at, std::move(initial)});
  }
}

bool LoadedImage::is_of(const struct stat &status) const {
  return is_same_file(status, status_) && is_same_content(status, status_) &&
         is_same_time(status.st_ctim, status_.st_ctim);
}

// A copy is nobody else's. Giving a file another name, or none, changes the time of its status.
bool LoadedImage::is_intact() const {
  struct stat now;
  return copy_.valid() || (::fstat(source_.get(), &now) == 0 && is_same_content(now, status_));
}

bool LoadedImage::reset() {
  if (has_other_variables_ || !is_intact()) return false;
  for (const Variables &variables : variables_) {
    copy(variables.initial.data(), variables.initial.size(), variables.at);
  }
  return true;
}

}  // namespace tee
