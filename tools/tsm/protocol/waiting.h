// SPDX-License-Identifier: BSD-2-Clause
/// Requests that wait for their answers.
///
/// A verified response proves who made it, not which request it answers: an earlier one, played
/// again, verifies as well. It is tied to its request by the IDs that it repeats. Two kinds repeat
/// none: GetTAInfo's, which is tied by SP and TA, and a failure that came before the device had
/// read the IDs (such as an UpdateSD for another device state), which is tied to the one request of
/// its kind that waits. Neither can be told from an earlier answer to the same.
#ifndef TSM_PROTOCOL_WAITING_H
#define TSM_PROTOCOL_WAITING_H

#include <cstdint>
#include <optional>
#include <span>
#include <string>
#include <string_view>

#include "tsm/protocol/messages.h"
#include "tsm/protocol/response.h"

namespace tsm {

struct SentRequest {
  const Message *message;
  std::string rid = {};  // with tid in all but GetTAInfo
  std::string tid = {};
  std::string spid = {};  // with taid in GetTAInfo
  std::string taid = {};
  std::string dsihash = {};  // of the state that it was made for; empty where it tells none
  uint64_t number = 0;       // counts the requests made for a device; 0: none of those that wait
};

/// Reads a request's text, which `tsm_key` must have signed; throws tools::UsageError.
SentRequest read_request(std::string_view text, const RsaKey &tsm_key);

Json sent_request_json(const SentRequest &request);
std::optional<SentRequest> parse_sent_request(const Json &value);

bool is_same_request(const SentRequest &one, const SentRequest &other);

/// How a response is known to answer its request.
enum class Tie { kIds, kSpAndTa, kOnlyOne, kUnchecked };
std::string_view tie_text(Tie tie);

/// Nothing when the response answers another request.
std::optional<Tie> tie_of(const Response &response, const SentRequest &request);

/// The request of `waiting` that the response answers. Throws NotVerified when there is none, and
/// when several could be meant.
const SentRequest &find_answered(const Response &response, std::span<const SentRequest> waiting);

}  // namespace tsm

#endif
