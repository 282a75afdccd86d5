// SPDX-License-Identifier: BSD-2-Clause
/// The groups of figures. Each measures on its own and adds to the report.
#ifndef BENCH_GROUPS_H
#define BENCH_GROUPS_H

#include <string>

#include "report.h"

namespace bench {

struct Bench {
  Effort effort;
  std::string work_directory;  // on a disk, for what is durable
  Report report;
};

void measure_exchanges(Bench &bench);
void measure_growth(Bench &bench);
void measure_capacity(Bench &bench);
void measure_base64(Bench &bench);
void measure_json(Bench &bench);
void measure_tokens(Bench &bench);
void measure_signatures(Bench &bench);
void measure_storage(Bench &bench);

}  // namespace bench

#endif
