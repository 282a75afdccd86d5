// SPDX-License-Identifier: BSD-2-Clause
/// The files of page/, as they stand there: put_into_program.cmake makes a source of them.
#ifndef TSM_SERVER_PAGE_FILES_H
#define TSM_SERVER_PAGE_FILES_H

#include <string_view>

namespace tsm {

struct PageFile {
  const char *path;
  const char *type;
  std::string_view content;
};

extern const PageFile kPageFiles[4];

}  // namespace tsm

#endif
