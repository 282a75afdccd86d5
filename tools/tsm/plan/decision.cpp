// SPDX-License-Identifier: BSD-2-Clause
#include "tsm/plan/decision.h"

#include <algorithm>

#include "tsm/protocol/dsi.h"

namespace tsm {
namespace {

constexpr int kMaxAttempts = 2;  // at one thing in a session

std::string quoted(const std::string &name) {
  return "\"" + printable(name) + "\"";
}

/// One decision. Each rule returns what is to be done by it, or nothing.
class Decider {
 public:
  Decider(const Plan &plan, const Progress &progress)
      : plan_(plan), progress_(progress), domains_(domains_of(*progress.state)) {}

  Decision decide() {
    Decision blocked = {.obstacles = obstacles()};
    if (!blocked.obstacles.empty()) return blocked;
    if (auto step = ask_for_owner()) return std::move(*step);
    blocked.obstacles = foreign_domains();
    if (!blocked.obstacles.empty()) return blocked;
    if (auto step = delete_others()) return std::move(*step);
    if (auto step = make_domains()) return std::move(*step);
    if (auto step = make_apps()) return std::move(*step);
    if (progress_.has_changed) return ask_for_state("to see what was done");
    return {};
  }

  static Decision ask_for_state(const std::string &reason) {
    return {.order = Order{MessageId::kGetDeviceState, {}}, .reason = reason};
  }

 private:
  using Step = std::optional<Decision>;

  const Domain *find_domain(const std::string &sd) const {
    const auto found = std::ranges::find(domains_, sd, &Domain::name);
    return found == domains_.end() ? nullptr : &*found;
  }
  const PlannedDomain *find_planned(const std::string &sd) const {
    const auto found = std::ranges::find(plan_.domains, sd, &PlannedDomain::sd);
    return found == plan_.domains.end() ? nullptr : &*found;
  }
  static bool has_app(const PlannedDomain &domain, const std::string &taid) {
    return std::ranges::find(domain.apps, taid, &PlannedApp::taid) != domain.apps.end();
  }
  std::optional<bool> is_ours(const std::string &sd) const {
    const auto found = progress_.is_ours.find(sd);
    return found == progress_.is_ours.end() ? std::nullopt : std::optional(found->second);
  }
  int num_attempts(const Order &order) const {
    const auto found = progress_.attempts.find(attempt_key(order));
    return found == progress_.attempts.end() ? 0 : found->second;
  }

  /// What was tried often enough is in the way.
  Decision take(Order order, const std::string &reason, int max_attempts = kMaxAttempts) const {
    if (num_attempts(order) < max_attempts) return {.order = std::move(order), .reason = reason};
    const std::string &refusal = progress_.last_refusal;
    return {.obstacles = {order_text(order) + " was tried without effect" +
                          (refusal.empty() ? "" : ": " + refusal)}};
  }

  /// What the state alone shows to be impossible.
  std::vector<std::string> obstacles() const {
    std::vector<std::string> found;
    for (const PlannedDomain &planned : plan_.domains) {
      const Domain *domain = find_domain(planned.sd);
      if (domain != nullptr && domain->spid != planned.sp) {
        found.push_back("domain " + quoted(planned.sd) + " belongs to service provider " +
                        quoted(domain->spid) + ", not to " + quoted(planned.sp));
      }
      for (const PlannedApp &app : planned.apps) add_misplaced(planned, app, &found);
    }
    return found;
  }

  /// A TA is registered once on a device, whatever the domain.
  void add_misplaced(const PlannedDomain &planned, const PlannedApp &app,
                     std::vector<std::string> *found) const {
    for (const Domain &domain : domains_) {
      const bool is_there = std::ranges::count(domain.tas, app.taid) != 0;
      const bool may_go = plan_.deletes_others && is_ours(domain.name) != false;
      if (!is_there || domain.name == planned.sd || may_go) continue;
      found->push_back("app " + quoted(app.taid) + " is in domain " + quoted(domain.name) +
                       " and the plan wants it in " + quoted(planned.sd));
    }
  }

  Order order_for(MessageId message, const Domain &domain) const {
    Order order = {message, {}};
    order.options.sdname = domain.name;
    order.options.spid = domain.spid;
    return order;
  }

  /// An UpdateSD that renews nothing is refused to another TSM than the domain's.
  Step ask_for_owner() const {
    for (const Domain &domain : domains_) {
      const bool matters = plan_.deletes_others || find_planned(domain.name) != nullptr;
      if (!matters || is_ours(domain.name)) continue;
      return take(order_for(MessageId::kUpdateSd, domain),
                  "to learn whose " + quoted(domain.name) + " is");
    }
    return {};
  }

  std::vector<std::string> foreign_domains() const {
    std::vector<std::string> found;
    for (const PlannedDomain &planned : plan_.domains) {
      if (find_domain(planned.sd) != nullptr && is_ours(planned.sd) == false) {
        found.push_back("domain " + quoted(planned.sd) + " is managed by another TSM");
      }
    }
    return found;
  }

  /// TAs go one by one, also before their domain: only DeleteTA takes their images out of the
  /// device's register.
  Step delete_others() const {
    if (!plan_.deletes_others) return {};
    for (const Domain &domain : domains_) {
      if (is_ours(domain.name) == false) continue;
      const PlannedDomain *planned = find_planned(domain.name);
      for (const std::string &taid : domain.tas) {
        if (planned != nullptr && has_app(*planned, taid)) continue;
        Order order = order_for(MessageId::kDeleteTa, domain);
        order.options.taid = taid;
        return take(std::move(order), "it is not planned");
      }
      if (planned != nullptr) continue;
      Order order = order_for(MessageId::kDeleteSd, domain);
      order.options.deleteta = "true";
      return take(std::move(order), "it is not planned");
    }
    return {};
  }

  Step make_domains() const {
    for (const PlannedDomain &planned : plan_.domains) {
      Order order = {MessageId::kCreateSd, {}};
      order.options.sdname = planned.sd;
      order.options.spid = planned.sp;
      order.options.spcert = planned.spcert;
      if (find_domain(planned.sd) == nullptr) return take(std::move(order), "it is missing");
      if (progress_.imagined_aiks.contains(planned.sp)) continue;
      if (has_aik(*progress_.state, planned.sp)) continue;
      order.message = MessageId::kUpdateSd;
      order.options.renew_aik = true;
      return take(std::move(order), quoted(planned.sp) + " has lost its key");
    }
    return {};
  }

  Step make_apps() const {
    for (const PlannedDomain &planned : plan_.domains) {
      for (const PlannedApp &app : planned.apps) {
        if (auto step = make_app(planned, app)) return step;
      }
    }
    return {};
  }

  Step make_app(const PlannedDomain &planned, const PlannedApp &app) const {
    Order order = {MessageId::kGetTaInfo, {}};
    order.options.sdname = planned.sd;
    order.options.spid = planned.sp;
    order.options.taid = app.taid;
    const bool is_there = std::ranges::count(find_domain(planned.sd)->tas, app.taid) != 0;
    if (!is_there) return take(with_image(order, MessageId::kInstallTa, app), "it is missing");
    const bool is_in_doubt = progress_.doubtful.contains(app.taid);
    const auto version = progress_.versions.find(app.taid);
    if (!is_in_doubt && version == progress_.versions.end()) {
      return take(std::move(order), "to learn its version");
    }
    if (!is_in_doubt && version->second == app.version) return {};
    return update_app(
        with_image(order, MessageId::kUpdateTa, app),
        is_in_doubt ? "it may be half installed" : "it has version " + quoted(version->second));
  }

  /// One that cannot be updated goes, and is installed anew.
  Decision update_app(Order order, const std::string &reason) const {
    if (num_attempts(order) == 0) return {.order = std::move(order), .reason = reason};
    order.message = MessageId::kDeleteTa;
    return take(std::move(order), "it cannot be updated", 1);
  }

  static Order with_image(Order order, MessageId message, const PlannedApp &app) {
    order.message = message;
    order.options.ta_version = app.version;
    order.options.image = app.image;
    return order;
  }

  const Plan &plan_;
  const Progress &progress_;
  const std::vector<Domain> domains_;
};

}  // namespace

Decision decide(const Plan &plan, const Progress &progress) {
  if (progress.state) return Decider(plan, progress).decide();
  const Order order = {MessageId::kGetDeviceState, {}};
  const auto tried = progress.attempts.find(attempt_key(order));
  if (tried != progress.attempts.end()) {
    return {.obstacles = {"the device does not tell its state: " + progress.last_refusal}};
  }
  return Decider::ask_for_state("to begin with");
}

std::string order_text(const Order &order) {
  const RequestOptions &options = order.options;
  std::string text(message_of(order.message).command);
  if (!options.taid.empty()) text += " " + printable(options.taid) + " in";
  if (!options.sdname.empty()) text += " " + printable(options.sdname);
  return text;
}

}  // namespace tsm
