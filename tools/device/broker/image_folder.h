// SPDX-License-Identifier: BSD-2-Clause
/// A folder that TA images are handed over in, to whatever loads them: TAID.img, each.
#ifndef DEVICE_BROKER_IMAGE_FOLDER_H
#define DEVICE_BROKER_IMAGE_FOLDER_H

#include <string>
#include <string_view>

namespace broker {

class ImageFolder {
 public:
  /// Throws tools::UsageError unless files can be made in `folder`.
  explicit ImageFolder(std::string folder);

  /// The file of the TA is replaced, safely on disk, or is as it was. Throws tools::UsageError. The
  /// TSM chooses the ID, so it must be a plain name: letters, digits and "-_.", of at most 64
  /// characters, beginning with a letter or digit.
  void keep(const std::string &taid, std::string_view image) const;

 private:
  std::string folder_;
};

}  // namespace broker

#endif
