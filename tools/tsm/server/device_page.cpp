// SPDX-License-Identifier: BSD-2-Clause
#include "tsm/server/device_page.h"

#include <algorithm>

#include "tsm/plan/decision.h"
#include "tsm/protocol/dsi.h"
#include "tsm/server/stored_progress.h"

namespace tsm {
namespace {

template <class Items, class Key, class Member>
auto find_by(const Items &items, const Key &key, Member member) {
  const auto found = std::ranges::find(items, key, member);
  return found == items.end() ? nullptr : &*found;
}

void add_new(const std::string &name, std::vector<std::string> *names) {
  if (std::ranges::find(*names, name) == names->end()) names->push_back(name);
}

/// The device's tree and its plan's, laid over each other: what the device has comes first.
class Comparison {
 public:
  Comparison(const StoredDevice &row, const Plan *plan, const Progress &progress)
      : row_(row), plan_(plan), progress_(progress) {
    if (progress.state) domains_ = domains_of(*progress.state);
  }

  Json tree() {
    std::vector<std::string> sps;
    if (progress_.state) sps = service_providers(*progress_.state);
    for (const PlannedDomain &planned : planned_domains()) add_new(planned.sp, &sps);
    for (const std::string &sp : sps) add_provider(sp);
    return rows_;
  }

 private:
  struct Side {
    std::optional<std::string> device = {};
    std::optional<std::string> plan = {};
    std::string other = {};  // how it is not as planned, where both have it
  };

  const std::vector<PlannedDomain> &planned_domains() const {
    static const std::vector<PlannedDomain> none;
    return plan_ == nullptr ? none : plan_->domains;
  }

  void add(int depth, const char *kind, const std::string &name, const Side &side,
           const std::string &fate) {
    std::string mark = "same";
    std::string difference = "as planned";
    if (plan_ == nullptr || !progress_.state) {
      mark = "none";
      difference = plan_ == nullptr ? "no plan" : "not known yet";
    } else if (!side.device) {
      mark = difference = "missing";
    } else if (!side.plan) {
      mark = "extra";
      difference = fate;
    } else if (!side.other.empty()) {
      mark = "other";
      difference = side.other;
    }
    const auto json = [](const auto &text) { return text ? Json(*text) : Json(); };
    rows_.push_back({{"depth", depth},
                     {"kind", kind},
                     {"name", name},
                     {"device", json(side.device)},
                     {"plan", json(side.plan)},
                     {"mark", mark},
                     {"difference", difference}});
  }

  /// What becomes of something in `domain` that is not planned.
  std::string fate_in(const std::string &domain) const {
    const auto is_ours = progress_.is_ours.find(domain);
    if (is_ours != progress_.is_ours.end() && !is_ours->second) return "another TSM's, stays";
    return plan_ != nullptr && plan_->deletes_others ? "not planned, to be deleted"
                                                     : "not planned, stays";
  }

  void add_provider(const std::string &sp) {
    Side side;
    std::vector<std::string> names;
    const auto key = progress_.state ? find_aik(*progress_.state, sp) : std::nullopt;
    for (const Domain &domain : domains_) {
      if (domain.spid == sp) add_new(domain.name, &names);
    }
    if (!names.empty() || key) side.device = key ? "AIK " + key->fingerprint() : "no AIK";
    for (const PlannedDomain &planned : planned_domains()) {
      if (planned.sp != sp) continue;
      side.plan = "with an AIK";
      add_new(planned.sd, &names);
    }
    if (!key) side.other = "has lost its AIK";
    add(0, "SP", sp, side, "not planned, stays");
    for (const std::string &name : names) add_domain(sp, name);
  }

  void add_domain(const std::string &sp, const std::string &name) {
    const Domain *domain = find_by(domains_, name, &Domain::name);
    if (domain != nullptr && domain->spid != sp) domain = nullptr;
    const PlannedDomain *planned = find_by(planned_domains(), name, &PlannedDomain::sd);
    if (planned != nullptr && planned->sp != sp) planned = nullptr;
    Side side;
    const auto is_ours = progress_.is_ours.find(name);
    const bool is_foreign = is_ours != progress_.is_ours.end() && !is_ours->second;
    if (domain != nullptr) side.device = is_foreign ? "another TSM's" : "there";
    if (planned != nullptr) side.plan = "there";
    if (is_foreign) side.other = "another TSM's";
    add(1, "domain", name, side, fate_in(name));

    std::vector<std::string> taids;
    if (domain != nullptr) taids = domain->tas;
    if (planned != nullptr) {
      for (const PlannedApp &app : planned->apps) add_new(app.taid, &taids);
    }
    for (const std::string &taid : taids) add_app(taid, domain, planned);
  }

  void add_app(const std::string &taid, const Domain *domain, const PlannedDomain *planned) {
    const PlannedApp *app = nullptr;
    if (planned != nullptr) app = find_by(planned->apps, taid, &PlannedApp::taid);
    Side side;
    if (app != nullptr) side.plan = "version " + app->version;
    if (domain != nullptr && std::ranges::count(domain->tas, taid) != 0) {
      side.device = version_of(taid, app);
      if (progress_.doubtful.contains(taid)) {
        side.device = side.other = "may be half installed";
      } else if (app != nullptr && side.device != side.plan) {
        side.other =
            progress_.versions.contains(taid) ? "other version" : "version to be asked for";
      }
    }
    add(2, "TA", taid, side, fate_in(domain != nullptr ? domain->name : ""));
  }

  /// A device that meets its plan has told the planned versions.
  std::string version_of(const std::string &taid, const PlannedApp *app) const {
    const auto told = progress_.versions.find(taid);
    if (told != progress_.versions.end()) return "version " + told->second;
    const bool is_met = row_.standing == Standing::kCurrent && app != nullptr;
    return is_met ? "version " + app->version : "there";
  }

  const StoredDevice &row_;
  const Plan *plan_;
  const Progress &progress_;
  std::vector<Domain> domains_;
  Json rows_ = Json::array();
};

Json waiting_message(const StoredDevice &row, int64_t now) {
  if (row.open_message.empty()) return nullptr;
  std::string text = row.open_message;
  try {
    text = order_text(parse_open_request(row.open_request).order);
  } catch (const std::runtime_error &) {
    // A page is there to show what is damaged, too.
  }
  return {{"message", text}, {"deadline", row.deadline}, {"is_late", row.deadline <= now}};
}

Json next_step(const Plan *plan, const Progress &progress) {
  Decision decision;
  if (plan != nullptr) decision = decide(*plan, progress);
  return {{"message", decision.order ? order_text(*decision.order) : ""},
          {"reason", decision.reason},
          {"obstacles", decision.obstacles}};
}

}  // namespace

Json device_page(const StoredDevice &row, const std::vector<Event> &events, const Plan *plan,
                 int64_t now) {
  Progress progress = stored_progress(row);
  begin_session(&progress);
  progress.state = parse_json(row.state);
  Json list = Json::array();
  for (const Event &event : events) {
    list.push_back({{"time", event.time},
                    {"message", event.message},
                    {"outcome", event.outcome},
                    {"reason", event.reason},
                    {"next", event.next}});
  }
  return {{"id", row.device_id},
          {"group", row.group},
          {"plan", row.plan},
          {"state", name_of(row.standing)},
          {"reason", row.reason},
          {"seen", row.seen},
          {"others", plan == nullptr        ? ""
                     : plan->deletes_others ? "delete"
                                            : "keep"},
          {"waits", waiting_message(row, now)},
          {"next", next_step(plan, progress)},
          {"tree", Comparison(row, plan, progress).tree()},
          {"events", list}};
}

}  // namespace tsm
