// SPDX-License-Identifier: BSD-2-Clause
// Registers the groups of benchmarks and runs them. What comes out is for bench/report.
#include <openssl/crypto.h>
#include <tee_test.h>

#include <CLI/CLI.hpp>
#include <algorithm>
#include <cstdio>
#include <filesystem>

#include "suite.h"

namespace {

const struct {
  const char *name;
  void (*add)(bench::Suite &);
} kGroups[] = {
    {"exchanges", bench::add_exchanges},
    {"growth", bench::add_growth},
    {"capacity", bench::add_capacity},
    {"base64", bench::add_base64},
    {"json", bench::add_json},
    {"tokens", bench::add_tokens},
    {"signatures", bench::add_signatures},
    {"storage", bench::add_storage},
};

// Standard output stays empty: what there is to see is the table of all figures, at the end.
struct Progress : benchmark::BenchmarkReporter {
  bool ReportContext(const Context &) override { return true; }
  void ReportRuns(const std::vector<Run> &runs) override {
    std::fprintf(stderr, "measured: %s\n", runs.front().run_name.function_name.c_str());
  }
};

struct Options {
  CLI::App app{
      "Measures the agent against what bounds it. Takes the --benchmark_... options of "
      "Google Benchmark, too: --benchmark_out=FILE is where the figures go."};
  bench::Suite suite;
  std::vector<std::string> only;

  Options() {
    std::vector<std::string> names;
    for (const auto &group : kGroups) names.emplace_back(group.name);
    app.name("otrp-bench");
    app.add_flag("--quick", suite.quick,
                 "two rounds of everything: shows that it runs, measures nothing");
    app.add_option("--only", only, "groups to measure")->check(CLI::IsMember(names));
    app.add_option("--work", suite.work_directory, "a directory for durable devices; emptied")
        ->default_val("bench-work");
  }
};

void print_help() {
  std::fputs(Options().app.help().c_str(), stdout);
}

size_t run(Options &options) {
  for (const auto &group : kGroups) {
    const bool chosen =
        options.only.empty() || std::ranges::find(options.only, group.name) != options.only.end();
    if (chosen) group.add(options.suite);
  }
  benchmark::AddCustomContext("quick", options.suite.quick ? "yes" : "no");
  benchmark::AddCustomContext("openssl", OpenSSL_version(OPENSSL_VERSION));
  std::filesystem::remove_all(options.suite.work_directory);
  tee::test::reuse_generated_keys(4);  // nothing that is timed makes one
  Progress progress;
  return benchmark::RunSpecifiedBenchmarks(&progress);
}

}  // namespace

int main(int argc, char **argv) {
  benchmark::Initialize(&argc, argv, print_help);
  Options options;
  try {
    options.app.parse(argc, argv);
  } catch (const CLI::ParseError &error) {
    return options.app.exit(error) == 0 ? 0 : 2;
  }
  try {
    return run(options) == 0 ? 2 : 0;
  } catch (const std::exception &error) {
    std::fprintf(stderr, "otrp-bench: %s\n", error.what());
    return 1;
  }
}
