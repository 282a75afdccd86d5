// SPDX-License-Identifier: BSD-2-Clause
// Measures group by group and writes what it found as JSON.
#include <tee_test.h>

#include <CLI/CLI.hpp>
#include <algorithm>
#include <cstdio>
#include <fstream>

#include "groups.h"

namespace {

struct Group {
  const char *name;
  void (*measure)(bench::Bench &);
};

const Group kGroups[] = {
    {"exchanges", bench::measure_exchanges},
    {"growth", bench::measure_growth},
    {"capacity", bench::measure_capacity},
    {"base64", bench::measure_base64},
    {"json", bench::measure_json},
    {"tokens", bench::measure_tokens},
    {"signatures", bench::measure_signatures},
    {"storage", bench::measure_storage},
};

void measure_all(const std::vector<std::string> &only, bench::Bench &bench) {
  for (const Group &group : kGroups) {
    if (!only.empty() && std::ranges::find(only, group.name) == only.end()) continue;
    std::fprintf(stderr, "measuring: %s\n", group.name);
    const tee::test::TraceSink log;  // nothing that is measured waits for a terminal
    group.measure(bench);
  }
}

void write_report(const std::string &path, const std::string &text) {
  std::ofstream file(path);
  file << text;
  file.close();
  if (!file) throw std::runtime_error("cannot write " + path);
}

}  // namespace

int main(int argc, char **argv) {
  CLI::App app{"Measures the agent against what bounds it"};
  bench::Bench bench;
  bool quick = false;
  std::string output = "figures.json";
  std::vector<std::string> only;
  std::vector<std::string> names;
  for (const Group &group : kGroups) names.emplace_back(group.name);
  app.add_flag("--quick", quick, "two rounds of everything: shows that it runs, measures nothing");
  app.add_option("--only", only, "groups to measure")->check(CLI::IsMember(names));
  app.add_option("-o,--output", output, "where the figures go");
  app.add_option("--work", bench.work_directory, "a directory for durable devices; emptied")
      ->default_val("bench-work");
  try {
    app.parse(argc, argv);
  } catch (const CLI::ParseError &error) {
    return app.exit(error) == 0 ? 0 : 2;
  }
  if (quick) bench.effort = bench::kQuick;
  try {
    measure_all(only, bench);
    write_report(output, bench.report.json(quick));
  } catch (const std::exception &error) {
    std::fprintf(stderr, "otrp-bench: %s\n", error.what());
    return 1;
  }
  return 0;
}
