// SPDX-License-Identifier: BSD-2-Clause
#include "tsm/server/plan_shelf.h"

#include <algorithm>
#include <stdexcept>

#include "tsm/protocol/json.h"

namespace tsm {
namespace {

constexpr size_t kNumPlans = 16;

std::string digest_of(std::string_view bytes) {
  return hex_encode(sha256(bytes));
}

Bytes read_image(const std::string &digest, Store *store) {
  std::optional<std::string> image = store->find_image(digest);
  if (!image || digest_of(*image) != digest) {
    throw std::runtime_error("the stored image " + digest + " is not whole");
  }
  return std::move(*image);
}

enum class Images { kRead, kLeft };

Plan read_stored_plan(const std::string &digest, Store *store, Images images) {
  const std::optional<std::string> document = store->find_plan_document(digest);
  if (!document || digest_of(*document) != digest) {
    throw std::runtime_error("the stored plan " + digest + " is not whole");
  }
  const Json value = Json::parse(*document);
  Plan plan;
  plan.deletes_others = value.at("others") == "delete";
  for (const Json &domain : value.at("domains")) {
    PlannedDomain planned;
    planned.sd = domain.at("sd");
    planned.sp = domain.at("sp");
    planned.spcert = domain.at("cert");
    for (const Json &app : domain.at("apps")) {
      planned.apps.push_back(
          {.taid = app.at("taid"),
           .version = app.at("version"),
           .image = images == Images::kRead ? read_image(app.at("image"), store) : Bytes()});
    }
    plan.domains.push_back(std::move(planned));
  }
  return plan;
}

}  // namespace

StoredPlan stored_plan(const Plan &plan) {
  StoredPlan stored;
  Json domains = Json::array();
  for (const PlannedDomain &domain : plan.domains) {
    Json apps = Json::array();
    for (const PlannedApp &app : domain.apps) {
      const std::string digest = digest_of(app.image);
      stored.images[digest] = app.image;
      apps.push_back({{"taid", app.taid}, {"version", app.version}, {"image", digest}});
    }
    domains.push_back(
        {{"sd", domain.sd}, {"sp", domain.sp}, {"cert", domain.spcert}, {"apps", apps}});
  }
  stored.document =
      Json{{"domains", domains}, {"others", plan.deletes_others ? "delete" : "keep"}}.dump();
  stored.digest = digest_of(stored.document);
  return stored;
}

Plan plan_outline(const std::string &digest, Store *store) {
  return read_stored_plan(digest, store, Images::kLeft);
}

std::shared_ptr<const Plan> PlanShelf::find_here(const std::string &digest) {
  const std::lock_guard guard(lock_);
  const auto found = std::ranges::find(entries_, digest, &Entry::digest);
  return found == entries_.end() ? nullptr : found->plan;
}

std::shared_ptr<const Plan> PlanShelf::find(const std::string &digest) {
  if (digest.empty()) return nullptr;
  if (std::shared_ptr<const Plan> plan = find_here(digest)) return plan;
  auto plan = std::make_shared<const Plan>(read_stored_plan(digest, store_, Images::kRead));
  const std::lock_guard guard(lock_);
  entries_.push_front({digest, plan});
  if (entries_.size() > kNumPlans) entries_.pop_back();
  return plan;
}

}  // namespace tsm
