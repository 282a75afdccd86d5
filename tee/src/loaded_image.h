// SPDX-License-Identifier: BSD-2-Clause
/// The shared object of a trusted application's image, loaded for one instance at a time.
#ifndef TEE_LOADED_IMAGE_H
#define TEE_LOADED_IMAGE_H

#include <sys/stat.h>

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "host_file.h"

namespace tee {

/// Shares its variables with no other one, even of the same file.
class LoadedImage {
 public:
  /// Throws an Error that says what is wrong with the file.
  static std::unique_ptr<LoadedImage> load(const std::string &file);
  ~LoadedImage();
  LoadedImage(const LoadedImage &) = delete;
  LoadedImage &operator=(const LoadedImage &) = delete;

  /// What TEE_TA_IMAGE_SYMBOL names, or NULL.
  const void *header() const { return header_; }

  const std::string &file() const { return file_; }

  /// Whether a file of which the system says this is still the one that was loaded.
  bool is_of(const struct stat &status) const;

  /// Sets all variables to what they were when the image had just been loaded. False when it
  /// cannot, or the file, wherever it is now, was written to: the image is then used up.
  bool reset();

 private:
  struct Variables {
    volatile uint8_t *at;
    std::vector<uint8_t> initial;
  };

  explicit LoadedImage(const std::string &file);
  void open();
  void remember_variables();
  bool is_intact() const;

  const std::string file_;
  host::File source_;        // keeps hold of the file, though others may take its place
  struct stat status_ = {};  // of the file, when it was loaded
  host::File copy_;          // where it was loaded from, when not from the file itself
  void *handle_ = nullptr;
  const void *header_ = nullptr;
  std::vector<Variables> variables_;
  bool has_other_variables_ = false;  // of each thread
};

}  // namespace tee

#endif
