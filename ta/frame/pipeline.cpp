// SPDX-License-Identifier: BSD-2-Clause
#include "frame/pipeline.h"

#include "cursor.h"
#include "failure.h"
#include "frame/message_table.h"
#include "message.h"
#include "otrp_result.h"
#include "ownership.h"
#include "platform.h"

namespace {

constexpr uint32_t kWordLen = 4;

// The caller's output buffer and what has been put into it.
struct output {
  uint8_t *buffer;
  uint32_t capacity;
  uint32_t response_len;  // R
};

// What a message needs while it is worked on; freed when the command ends.
struct work {
  slice_ptr message;
  slice_ptr payload;
  token_object_ptr request;
  tee_ptr<char> tsmid;
  tee_ptr<char> response;
  secret_bytes image;
};

}  // namespace

void put_answer_head(uint8_t *out, TEE_Result status, uint32_t response_len) {
  writer head = {out, kAnswerHeadLen};
  put_u32(&head, status);
  put_u32(&head, response_len);
}

// ---- The output buffer as working memory

jsmn_string *borrow_share_memory(void *destination, const jsmn_string *slice) {
  CHECK(destination != nullptr && slice != nullptr, nullptr, "borrow_share_memory input is NULL");
  jsmn_string *copy = jsmn_init_string();
  if (copy == nullptr) return nullptr;
  auto *text = static_cast<char *>(destination);
  if (slice->len != 0) memcpy(text, slice->data, slice->len);
  text[slice->len] = 0;
  copy->data = text;
  copy->len = slice->len;
  return copy;
}

void return_borrow_share_memory(void *destination, const jsmn_string *slice) {
  if (destination == nullptr || slice == nullptr) {
    trace_error("return_borrow_share_memory", __LINE__, "borrow_share_memory input is NULL");
    return;
  }
  wipe(destination, slice->len + 1);
}

TEE_Result add_ta_bin_to_out_buf(void *destination, const uint8_t *image, uint32_t image_len) {
  CHECK(destination != nullptr && image != nullptr && image_len != 0, OTRP_MISSING,
        "add_ta_bin_to_out_buf input is NULL");
  writer out = {static_cast<uint8_t *>(destination), kWordLen + image_len};
  put_block(&out, {image, image_len});
  return out.ok ? TEE_SUCCESS : OTRP_NO_MEMORY;
}

// ---- The input frame

// The word and both blocks at the start of a frame are for nobody, but they must be there, and fit
// the heap.
static bool take_copy(reader *in, uint32_t len, tee_ptr<uint8_t> *copy) {
  const uint8_t *bytes = nullptr;
  copy->reset(allocate_bytes(len));
  if (!*copy || !take(in, len, &bytes)) return false;
  memcpy(copy->get(), bytes, len);
  return true;
}

static bool take_block(reader *in, tee_ptr<uint8_t> *block) {
  uint32_t len = 0;
  return take_u32(in, &len) && len != 0 && len <= in->left && take_copy(in, len, block);
}

static TEE_Result read_frame_head(reader *in, uint32_t *message_id) {
  if (in->left == 0 || reinterpret_cast<uintptr_t>(in->at) > UINTPTR_MAX - in->left) {
    return TEE_ERROR_BAD_PARAMETERS;
  }
  const tee_ptr<uint8_t> reserved(allocate_bytes(kWordLen));
  if (!reserved) return TEE_ERROR_OUT_OF_MEMORY;
  const uint8_t *word = nullptr;
  if (!take(in, kWordLen, &word)) return TEE_ERROR_BAD_PARAMETERS;
  memcpy(reserved.get(), word, kWordLen);

  tee_ptr<uint8_t> first;
  tee_ptr<uint8_t> second;
  const bool whole = take_block(in, &first) && take_block(in, &second) && take_u32(in, message_id);
  return whole ? TEE_SUCCESS : TEE_ERROR_BAD_PARAMETERS;
}

// ---- The stages of a message. Their lines carry the command's name.

static const char kName[] = "OTrP_TaInvokeCmd";

static TEE_Result verify(const message_entry *entry, const jsmn_string *message,
                         secret_bytes *payload, token_object_ptr *request) {
  request_context context = {};
  context.message = reinterpret_cast<const uint8_t *>(message->data);
  context.message_len = message->len;
  context.request_name = entry->request_name;
  const TEE_Result result = entry->verify(&context);
  payload->data = context.payload;
  payload->len = context.payload_len;
  request->reset(context.tokens);
  CHECK_AS(kName, result == TEE_SUCCESS, result, "Failed to verify message");
  return TEE_SUCCESS;
}

// Finds out which TSM sent the message; a GetTAInfo request names none. One that is named and
// cannot be copied is not left out: the message would fail as another TSM's.
static TEE_Result read_sender(work *job) {
  if (!job->request) job->request.reset(jsmn_init_object(job->message.get()));
  CHECK_AS(kName, job->request, OTRP_BAD_REQUEST, "init request_json get NULL");
  const slice_ptr tsmid(jsmn_object_get_string(job->request.get(), "tsmid"));
  CHECK_AS(kName, tsmid, OTRP_NO_MEMORY, "no memory for tsmid");
  if (tsmid->len == 0) return TEE_SUCCESS;
  job->tsmid.reset(jsmn_string_dup(tsmid->data, tsmid->len));
  CHECK_AS(kName, job->tsmid, OTRP_NO_MEMORY, "no memory for tsmid");
  return TEE_SUCCESS;
}

// Moves the payload into the output buffer, so that the heap holds no copy while it is processed.
static TEE_Result place_payload(secret_bytes *payload, const output &out, work *job,
                                slice_ptr *placed) {
  CHECK_AS(kName, payload->data != nullptr && payload->len != 0, OTRP_BAD_REQUEST,
           "after verify_decode get tbs json is NULL");
  job->payload->data = reinterpret_cast<const char *>(payload->data);
  job->payload->len = payload->len;
  if (payload->len < out.capacity - kAnswerHeadLen) {
    placed->reset(borrow_share_memory(out.buffer + kAnswerHeadLen, job->payload.get()));
  }
  job->payload->data = nullptr;
  CHECK_AS(kName, *placed && (*placed)->len != 0, OTRP_NO_MEMORY, "borrow_share_memory get NULL");
  payload->reset();
  return TEE_SUCCESS;
}

// Whatever comes of it, nothing of the payload stays in the output buffer.
static TEE_Result process(const message_entry *entry, const output &out, const slice_ptr &placed,
                          work *job) {
  ta_image image = {};
  char *response = nullptr;
  const token_object_ptr tbs(jsmn_init_object(placed.get()));
  const TEE_Result result =
      entry->process(job->tsmid.get(), tbs.get(), &response, &image, job->request.get());
  job->response.reset(response);
  job->image.data = image.data;
  job->image.len = image.len;
  return_borrow_share_memory(out.buffer + kAnswerHeadLen, placed.get());
  CHECK_AS(kName, result == TEE_SUCCESS, result, "Failed to process message");
  return TEE_SUCCESS;
}

static TEE_Result encode(const message_entry *entry, const work &job, output *out) {
  uint32_t len = out->capacity - kAnswerHeadLen;
  const TEE_Result result = entry->encode(job.response.get(), out->buffer + kAnswerHeadLen, &len);
  CHECK_AS(kName, result == TEE_SUCCESS, result, "Failed to encode message");
  out->response_len = len;
  return TEE_SUCCESS;
}

static bool has_image(const work &job) {
  return job.image.data != nullptr && job.image.len != 0;
}

static TEE_Result add_image(const work &job, const output &out) {
  if (!has_image(job)) return TEE_SUCCESS;
  const uint32_t offset = kAnswerHeadLen + out.response_len;
  CHECK_AS(kName, uint64_t{offset} + kWordLen + job.image.len <= out.capacity, OTRP_NO_MEMORY,
           "Failed to add ta_bin, rbuf too small");
  return add_ta_bin_to_out_buf(out.buffer + offset, job.image.data, job.image.len);
}

static TEE_Result answer_message(reader *in, uint32_t message_id, work *job, output *out) {
  const message_entry *entry = find_message(message_id);
  CHECK_AS(kName, entry != nullptr, OTRP_BAD_REQUEST, "Unknown OTrP cmd: 0x%x\n", message_id);
  uint32_t len = 0;
  const uint8_t *text = nullptr;
  if (!take_u32(in, &len) || !take(in, len, &text)) return OTRP_BAD_REQUEST;
  job->message->data = reinterpret_cast<const char *>(text);
  job->message->len = len;

  secret_bytes payload;
  slice_ptr placed;
  TRY(verify(entry, job->message.get(), &payload, &job->request));
  TRY(read_sender(job));
  TRY(place_payload(&payload, *out, job, &placed));
  TRY(process(entry, *out, placed, job));
  job->request.reset();  // signing needs more of the heap than anything else
  TRY(encode(entry, *job, out));
  return add_image(*job, *out);
}

TEE_Result OTrP_TaInvokeCmd(const void *in, uint32_t in_len, void *out, uint32_t *out_len) {
  CHECK(in != nullptr && in_len > kWordLen && out != nullptr && out_len != nullptr,
        TEE_ERROR_BAD_PARAMETERS, "Invalid parameters/length\n");
  CHECK(*out_len >= kAnswerHeadLen, TEE_ERROR_SHORT_BUFFER, "output buffer is too small\n");
  work job;
  job.message.reset(jsmn_init_string());
  job.payload.reset(jsmn_init_string());
  CHECK(job.message && job.payload, OTRP_NO_MEMORY,
        "Failed to allocate memory for request_json_str/request_json_tbs_str\n");

  output answer = {static_cast<uint8_t *>(out), *out_len, 0};
  put_answer_head(answer.buffer, OTRP_RESPONSE_FAILED, 0);
  reader frame = {static_cast<const uint8_t *>(in), in_len};
  uint32_t message_id = 0;
  const TEE_Result framed = read_frame_head(&frame, &message_id);
  if (framed != TEE_SUCCESS) {
    put_answer_head(answer.buffer, framed, 0);
    return framed;
  }

  const TEE_Result status = answer_message(&frame, message_id, &job, &answer);
  put_answer_head(answer.buffer, status, answer.response_len);
  *out_len = kAnswerHeadLen + answer.response_len;
  if (has_image(job)) *out_len += kWordLen + job.image.len;
  return TEE_SUCCESS;
}
