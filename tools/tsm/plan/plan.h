// SPDX-License-Identifier: BSD-2-Clause
/// What a device should hold, as an operator writes it:
///
///     {"domains": [{"sd": "wallet", "sp": "bank", "cert_file": "bank.pem",
///                   "apps": [{"taid": "71cce700000000000000000000000002",
///                             "version": "1.2", "image": "pay.img"}]}],
///      "others": "keep"}
///
/// "apps" may be left out, and "others": what the plan does not name is kept, or, with "delete",
/// removed where it is this TSM's. Files are found from the plan's folder.
#ifndef TSM_PLAN_PLAN_H
#define TSM_PLAN_PLAN_H

#include <string>
#include <vector>

#include "tsm/protocol/crypto.h"

namespace tsm {

struct PlannedApp {
  std::string taid;
  std::string version;
  Bytes image;
};

struct PlannedDomain {
  std::string sd;
  std::string sp;
  std::string spcert;
  std::vector<PlannedApp> apps;
};

struct Plan {
  std::vector<PlannedDomain> domains;
  bool deletes_others = false;
};

/// Reads a plan and all of its files. Throws tools::UsageError, with file and line, for one that no
/// device could be brought to, or that says something twice.
Plan read_plan(const std::string &file);

}  // namespace tsm

#endif
