# SPDX-License-Identifier: BSD-2-Clause
# cmake -D FOLDER=page -D OUTPUT=FILE.cpp -P put_into_program.cmake: a source that holds the page's
# files, byte by byte.
set(source "#include \"tsm/server/page_files.h\"\n\n")
set(rows "")
foreach(row "page.html;/;text/html" "page.css;/page.css;text/css" "page.js;/page.js;text/javascript"
        "icon.svg;/icon.svg;image/svg+xml")
  list(GET row 0 name)
  string(MAKE_C_IDENTIFIER "k_${name}" variable)
  list(GET row 1 path)
  list(GET row 2 type)
  file(READ "${FOLDER}/${name}" hex HEX)
  string(REGEX REPLACE "([0-9a-f][0-9a-f])" "\\\\x\\1" bytes "${hex}")
  string(LENGTH "${hex}" len)
  math(EXPR len "${len} / 2")
  string(APPEND source "static const char ${variable}[] = \"${bytes}\";\n")
  string(APPEND rows "    {\"${path}\", \"${type}; charset=utf-8\", {${variable}, ${len}}},\n")
endforeach()
string(APPEND source "\nconst tsm::PageFile tsm::kPageFiles[4] = {\n${rows}};\n")
file(WRITE "${OUTPUT}" "${source}")
