// SPDX-License-Identifier: BSD-2-Clause
/// The frame that the six state-changing messages share. run_exchange() opens the response and the
/// request, has the message do its work with the steps below, in its own order, and closes the
/// response, whatever came of that.
///
/// The steps are alike; what they insist on and what they say of a failure is not. Each message
/// states its own in an `exchange_form`.
#ifndef EXCHANGE_H
#define EXCHANGE_H

#include "message.h"
#include "ownership.h"
#include "platform.h"
#include "state/json.h"
#include "state/token_reader.h"

/// What a message insists on. A rule that is off leaves it to a later step to find out.
struct exchange_rules {
  /// A payload that is no JSON object is like a NULL input: there is no response.
  bool needs_payload = false;
  /// Without memory for the response's content the message ends at once, not when it is filled.
  bool needs_content = false;
  /// Without memory for looking "dsihash" up: OTRP_BAD_REQUEST. Off: OTRP_NO_MEMORY.
  bool needs_dsihash = false;
  /// A "content" that is no JSON: OTRP_NO_MEMORY. Off: OTRP_BAD_REQUEST, from the decryption.
  bool needs_jwe = false;
  /// A decrypted content that is no object: OTRP_NO_MEMORY. Off: all of its members are missing.
  bool needs_members = false;
  /// A refusal for the IDs or the hash gets a line of the message's own, besides the step's.
  bool names_step = false;
};

constexpr exchange_rules kAllRules = {true, true, true, true, true, true};

/// What a message says where messages differ. The rules decide which lines there are, not these: a
/// text that no rule asks for is never said. None is a format.
struct exchange_texts {
  /// For root and content; NULL: one line for both, which shows the pointers to what there is.
  const char *no_root = nullptr;
  const char *no_content = nullptr;
  /// NULL: a line with the object's name and the pointer.
  const char *no_response = nullptr;
  const char *no_request = nullptr;
  const char *no_dsihash = nullptr;
  const char *no_jwe = nullptr;
  const char *no_members = nullptr;
  const char *not_serialized = nullptr;
};

/// The two dialects: one shows pointers, the other names what was about to be done.
/// @{
constexpr exchange_texts kPointerTexts = {
    .no_request = "request_object is null",
    .not_serialized = "parse response_json to json string get NULL",
};
constexpr exchange_texts kStepTexts = {
    .no_root = "init response_root_value fail",
    .no_content = "init content_resp_value fail",
    .no_response = "init TBSResponse object fail",
    .no_request = "init TBSRequest_object from TBSRequest_value fail",
    .no_dsihash = "get dsihash null",
    .no_jwe = "get enc_content from TBSRequest_object null",
    .no_members = "get content_object null",
    .not_serialized = "parse response json to string out of mem",
};
/// @}

/// A message's row: what it calls things, what it insists on, what it says.
struct exchange_form {
  const char *process;       // name of the process function, under which all lines appear
  const char *tbs_request;   // member of the payload that holds the request
  const char *tbs_response;  // member of the response that holds all of it
  exchange_rules rules;
  exchange_texts texts;
};

/// One message on its way through its handler.
struct exchange {
  exchange(const exchange_form &own, const char *sender, const jsmn_object *whole)
      : form(&own), tsmid(sender), message(whole) {}

  const exchange_form *form;
  const char *tsmid;           // for whom the response's content is encrypted: the sender, at first
  const jsmn_object *message;  // all of it, with what stands beside the payload

  json_ptr root;                    // the response
  JSON_Object *response = nullptr;  // its object named tbs_response; NULL until it is there
  json_ptr content_value;           // the response's content, before it is encrypted
  JSON_Object *content = nullptr;

  token_object_ptr request;  // the to-be-signed request
  json_ptr decrypted;        // the request's content
  secret_bytes image;        // a TA image that goes along with the response, if there is one
};

/// A process function (message.h) for messages of this form. `carry_out` does their work; its
/// result is the outcome that the response tells.
[[nodiscard]] TEE_Result run_exchange(const exchange_form &form,
                                      TEE_Result (*carry_out)(exchange *x), const char *tsmid,
                                      const jsmn_object *tbs, char **response, ta_image *image,
                                      const jsmn_object *message);

/// Echoes "ver", "rid" and "tid".
[[nodiscard]] TEE_Result add_ids(exchange *x);

/// Refuses a request that was made for another state of the device.
[[nodiscard]] TEE_Result check_dsihash(const exchange &x);

/// Decrypts the request's "content" with the TEE key. `*members` stays the exchange's; it is NULL
/// when the content is no object and the message does not insist on one.
[[nodiscard]] TEE_Result decrypt_content(exchange *x, const JSON_Object **members);

#endif
