// SPDX-License-Identifier: BSD-2-Clause
// A change anywhere in a signed message is found out at the signature. So messages are opened,
// changed inside, and closed again.
#include "support/mutation.h"
#include "support/require.h"
#include "support/sealed_request.h"
#include "tsm/dsi.h"
#include "tsm/jwe.h"

using namespace fuzz;
using tsm::Json;

namespace {

void mutate_content(OpenedRequest *request, size_t max_len, Random &random) {
  static const tsm::RsaKey tee_key = stored_device().tee_key();
  request->content = mutate_json(*request->content, max_len, random);
  const auto cipher =
      random.one_in(4) ? tsm::ContentCipher::kA128Gcm : tsm::ContentCipher::kA128CbcHs256;
  (*request->members())["content"] =
      tsm::jwe_encrypt(tee_key, *request->content, {.cipher = cipher});
}

void mutate_image(OpenedRequest *request, size_t max_len) {
  static const tsm::RsaKey aik = tsm::find_aik(stored_device().dsi(), "bank").value();
  const std::string image = mutate_bytes(std::string(64, 'i'), max_len);
  (*request->members())["encrypted_ta"] =
      tsm::encrypted_ta(aik, image, tsm::image_member(request->message->id));
}

std::string taid_of(const OpenedRequest &request) {
  const auto content = tsm::parse_json(request.content.value_or(""));
  const std::string *taid = content ? tsm::find_string(*content, "taid") : nullptr;
  return taid == nullptr ? "" : *taid;
}

std::string mutate_message(const std::string &text, size_t max_len, Random &random) {
  std::optional<OpenedRequest> request = open_request(text);
  if (!request || random.one_in(4)) return mutate_json(text, max_len, random);
  if (request->content && !random.one_in(3)) {
    mutate_content(&*request, max_len, random);
    request->payload = tsm::serialize_as_device(request->tbs);
  } else if (request->members() != nullptr && random.one_in(4) &&
             !tsm::image_member(request->message->id).empty()) {
    mutate_image(&*request, max_len / 4);
    request->payload = tsm::serialize_as_device(request->tbs);
  } else {
    request->payload = mutate_json(request->payload, max_len, random);
  }
  return seal_payload(*request->message, request->payload, taid_of(*request));
}

}  // namespace

extern "C" size_t LLVMFuzzerCustomMutator(uint8_t *data, size_t size, size_t max_size,
                                          unsigned seed) {
  Random random(seed);
  const std::string_view input = as_view(data, size);
  std::optional<Frame> frame = parse_frame(input);
  if (!frame || random.one_in(8)) return give(mutate_bytes(input, max_size), data, max_size);
  frame->text = mutate_message(frame->text, max_size, random);
  if (random.one_in(16)) frame->message_id = static_cast<uint32_t>(1 + random.below(8));
  const std::string mutated = serialize_frame(*frame);
  if (mutated.size() > max_size) return give(mutate_bytes(input, max_size), data, max_size);
  return give(mutated, data, max_size);
}
