// SPDX-License-Identifier: BSD-2-Clause
#include "tsm/plan/progress.h"

#include <algorithm>

#include "common/agent_codes.h"
#include "tsm/protocol/dsi.h"

namespace tsm {
namespace {

constexpr int kMaxUnanswered = 3;  // questions about a TA, in a row

bool is_about_ta(MessageId id) {
  return id == MessageId::kInstallTa || id == MessageId::kUpdateTa || id == MessageId::kDeleteTa ||
         id == MessageId::kGetTaInfo;
}

void take_state(Json state, Progress *progress) {
  const std::vector<Domain> domains = domains_of(state);
  std::erase_if(progress->is_ours, [&](const auto &known) {
    return std::ranges::find(domains, known.first, &Domain::name) == domains.end();
  });
  std::erase_if(progress->doubtful, [&](const std::string &taid) {
    return std::ranges::none_of(
        domains, [&](const Domain &domain) { return std::ranges::count(domain.tas, taid) != 0; });
  });
  progress->state = std::move(state);
}

/// What an order that was carried out says beyond the state.
void note_success(const Order &order, Progress *progress) {
  const RequestOptions &options = order.options;
  switch (order.message) {
    case MessageId::kCreateSd:
    case MessageId::kUpdateSd:
      progress->is_ours[options.sdname] = true;
      break;
    case MessageId::kInstallTa:
    case MessageId::kUpdateTa:
      progress->versions[options.taid] = options.ta_version;
      progress->doubtful.erase(options.taid);
      break;
    case MessageId::kDeleteTa:
      progress->versions.erase(options.taid);
      progress->doubtful.erase(options.taid);
      break;
    case MessageId::kDeleteSd:
    case MessageId::kGetDeviceState:
    case MessageId::kGetTaInfo:
      break;
  }
}

void note_failure(const Order &order, Progress *progress) {
  if (!is_about_ta(order.message)) return;
  progress->versions.erase(order.options.taid);
  progress->doubtful.insert(order.options.taid);
}

/// SD_MISMATCH is the answer to who names another SP or is another TSM, and the SP is known.
void note_owner(const Order &order, const Response &response, Progress *progress) {
  const bool is_theirs =
      (order.message == MessageId::kUpdateSd && response.error_code == OTRP_SD_MISMATCH) ||
      (order.message == MessageId::kDeleteSd && response.error_code == OTRP_DSI_MISMATCH);
  if (is_theirs) progress->is_ours[order.options.sdname] = false;
}

/// The security domains of a document that has been checked.
Json &domain_list(Json *document) {
  return (*document)["dsi"]["tee"]["sdlist"]["sd"];
}

void imagine_domain(const RequestOptions &options, Progress *progress) {
  domain_list(&*progress->state)
      .push_back({{"name", options.sdname}, {"spid", options.spid}, {"talist", Json::array()}});
}

void imagine_ta(const RequestOptions &options, bool is_there, Progress *progress) {
  for (Json &domain : domain_list(&*progress->state)) {
    if (domain["name"] != options.sdname) continue;
    Json &list = domain["talist"];
    std::erase_if(list.get_ref<Json::array_t &>(),
                  [&](const Json &ta) { return ta.value("taid", "") == options.taid; });
    if (is_there) list.push_back({{"taid", options.taid}, {"taname", ""}});
  }
}

}  // namespace

bool changes_device(const Order &order) {
  return order.message != MessageId::kGetDeviceState && order.message != MessageId::kGetTaInfo &&
         !(order.message == MessageId::kUpdateSd && !order.options.renew_aik);
}

void begin_session(Progress *progress) {
  *progress = {.is_ours = std::move(progress->is_ours),
               .versions = std::move(progress->versions),
               .doubtful = std::move(progress->doubtful),
               .unanswered = std::move(progress->unanswered)};
}

std::string attempt_key(const Order &order) {
  const bool is_about_sd = order.message != MessageId::kGetDeviceState;
  return std::string(message_of(order.message).command) + " " +
         (is_about_ta(order.message) ? order.options.taid
          : is_about_sd              ? order.options.sdname
                                     : "");
}

void learn(const Order &order, const Response &response, const std::string &refusal,
           Progress *progress) {
  if (changes_device(order)) progress->has_changed = true;
  if (changes_device(order) || !refusal.empty()) ++progress->attempts[attempt_key(order)];
  if (!refusal.empty()) {
    note_failure(order, progress);
    note_owner(order, response, progress);
    progress->last_refusal = refusal;
    progress->state.reset();
    return;
  }
  note_success(order, progress);
  if (order.message == MessageId::kGetDeviceState) progress->has_changed = false;
  if (order.message == MessageId::kGetTaInfo) {
    progress->unanswered.erase(order.options.taid);
    const std::string *version = find_string(response.members, "ta_version");
    progress->versions[order.options.taid] = version == nullptr ? "" : *version;
  } else if (const Json *dsi = find_object(response.content, "dsi")) {
    take_state({{"dsi", *dsi}}, progress);
  }
}

void learn_nothing(const Order &order, const std::string &why, Progress *progress) {
  ++progress->attempts[attempt_key(order)];
  progress->last_refusal = why;
  progress->has_changed = progress->has_changed || changes_device(order);
  note_failure(order, progress);
  if (order.message != MessageId::kGetTaInfo) progress->state.reset();
}

void learn_loss(const Order &order, const std::string &why, Progress *progress) {
  const std::string &taid = order.options.taid;
  const bool is_question = order.message == MessageId::kGetTaInfo;
  if (is_question && ++progress->unanswered[taid] < kMaxUnanswered) return;
  progress->unanswered.erase(taid);
  learn_nothing(order, why, progress);
}

void settle(Progress *progress) {
  progress->versions.clear();
}

void imagine(const Order &order, Progress *progress) {
  note_success(order, progress);
  if (!changes_device(order)) return;
  ++progress->attempts[attempt_key(order)];
  const RequestOptions &options = order.options;
  switch (order.message) {
    case MessageId::kCreateSd:
      imagine_domain(options, progress);
      [[fallthrough]];
    case MessageId::kUpdateSd:
      progress->imagined_aiks.insert(options.spid);
      break;
    case MessageId::kDeleteSd:
      std::erase_if(domain_list(&*progress->state).get_ref<Json::array_t &>(),
                    [&](const Json &domain) { return domain["name"] == options.sdname; });
      break;
    case MessageId::kInstallTa:
    case MessageId::kUpdateTa:
      imagine_ta(options, true, progress);
      break;
    case MessageId::kDeleteTa:
      imagine_ta(options, false, progress);
      break;
    case MessageId::kGetDeviceState:
    case MessageId::kGetTaInfo:
      break;
  }
}

/// What is empty is left out: it takes as long to read as the rest.
Json progress_json(const Progress &progress) {
  Json value = Json::object();
  if (!progress.is_ours.empty()) value["is_ours"] = progress.is_ours;
  if (!progress.versions.empty()) value["versions"] = progress.versions;
  if (!progress.doubtful.empty()) value["doubtful"] = progress.doubtful;
  if (!progress.unanswered.empty()) value["unanswered"] = progress.unanswered;
  return value;
}

Progress parse_progress(const Json &value) {
  Progress progress;
  if (const Json *is_ours = find_object(value, "is_ours")) {
    for (const auto &[name, is_it] : is_ours->items()) {
      if (is_it.is_boolean()) progress.is_ours[name] = is_it.get<bool>();
    }
  }
  if (const Json *versions = find_object(value, "versions")) {
    for (const auto &[taid, version] : versions->items()) {
      if (version.is_string()) progress.versions[taid] = version.get<std::string>();
    }
  }
  if (const Json *unanswered = find_object(value, "unanswered")) {
    for (const auto &[taid, number] : unanswered->items()) {
      if (number.is_number_integer()) progress.unanswered[taid] = number.get<int>();
    }
  }
  if (const Json *doubtful = find_array(value, "doubtful")) {
    for (const Json &taid : *doubtful) {
      if (taid.is_string()) progress.doubtful.insert(taid.get<std::string>());
    }
  }
  return progress;
}

}  // namespace tsm
