// SPDX-License-Identifier: BSD-2-Clause
/// The command lines as an operator meets them: exit codes, standard streams, files left behind.
#ifndef PROGRAM_H
#define PROGRAM_H

#include <gtest/gtest.h>
#include <sys/wait.h>

#include <cstdlib>
#include <string>

#include "../support/temporary_folder.h"
#include "common/files.h"

class Program : public testing::Test {
 protected:
  struct Outcome {
    int exit_code;
    std::string out;
    std::string err;
  };

  explicit Program(const std::string &program) : program_(program) {}

  std::string path(const std::string &name) const { return folder_.path / name; }
  std::string read(const std::string &name) const { return tools::read_file(path(name)); }
  void write(const std::string &name, const std::string &bytes) const {
    tools::write_file(path(name), bytes);
  }

  /// In the test's directory.
  Outcome run(const std::string &arguments, const std::string &input = "") const {
    write("in", input);
    const std::string command = "cd " + folder_.path.string() + " && { " + program_ + " " +
                                arguments + "; } <in >out 2>err";
    const int status = std::system(command.c_str());
    return {WIFEXITED(status) ? WEXITSTATUS(status) : -1, read("out"), read("err")};
  }

 private:
  std::string program_;
  TemporaryFolder folder_;
};

#endif
