// SPDX-License-Identifier: BSD-2-Clause
/// What result codes mean, and what to do next: `otrp-tsm explain`.
#ifndef TSM_CLI_EXPLAIN_H
#define TSM_CLI_EXPLAIN_H

#include "tsm/cli/commands.h"

namespace tsm {

/// Explains `arguments.codes`, which tools::find_result_by_text() reads, or "all".
int run_explain(const Arguments &arguments);

}  // namespace tsm

#endif
