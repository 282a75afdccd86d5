// SPDX-License-Identifier: BSD-2-Clause
/// The frame that the six state-changing messages share. A handler is three stages:
///
///     open_response()      the response's objects
///     the message's work   with the steps below, in its own order
///     close_response()     the outcome, whatever it was, as a response text
///
/// The steps are alike; their texts and some of their codes are not. Each message states its own
/// in an `exchange_texts`.
#ifndef EXCHANGE_H
#define EXCHANGE_H

#include "ownership.h"
#include "platform.h"
#include "state/json.h"
#include "state/token_reader.h"

/// What a message calls things and says of failures. A NULL text: this message says nothing there.
struct exchange_texts {
  const char *process;       // name of the process function, under which all lines appear
  const char *tbs_request;   // member of the payload that holds the request
  const char *tbs_response;  // member of the response that holds all of it
  const char *null_input;
  bool needs_tbs;  // a payload that is no JSON object is a NULL input

  // Of open_response(). Each may use the pointers root value, root object, content value.
  const char *no_root;
  const char *no_root_object;
  const char *no_content;         // NULL: noticed only when the content is needed
  const char *no_content_object;  // likewise
  const char *no_response_object;

  const char *no_request;
  const char *ids_failed;
  const char *no_dsihash;  // NULL: a header that cannot be made counts as no hash
  const char *dsihash_failed;
  const char *content_unreadable;  // NULL: left to the decryption, which says so
  const char *content_no_object;   // NULL: the members of such a content are all missing

  const char *not_serialized;
};

/// One message on its way through its handler.
struct exchange {
  exchange(const exchange_texts &say, const char *sender) : texts(&say), tsmid(sender) {}

  const exchange_texts *texts;
  const char *tsmid;  // for whom the response's content is encrypted: the sender, at first

  json_ptr root;                    // the response
  JSON_Object *response = nullptr;  // its object named tbs_response; NULL until it is there
  json_ptr content_value;           // the response's content, before it is encrypted
  JSON_Object *content = nullptr;

  token_object_ptr request;  // the to-be-signed request
  json_ptr decrypted;        // the request's content
};

/// Checks the arguments of a process function and clears `*response`. OTRP_MISSING means that the
/// process function returns that.
[[nodiscard]] TEE_Result check_input(const exchange_texts &texts, const jsmn_object *tbs,
                                     char **response);

/// Makes the response's objects. After a failure there will be no response: close_response()
/// finds that out.
[[nodiscard]] TEE_Result open_response(exchange *x);

/// Finds the to-be-signed request in the payload.
[[nodiscard]] TEE_Result open_request(exchange *x, const jsmn_object *tbs);

/// Echoes "ver", "rid" and "tid".
[[nodiscard]] TEE_Result add_ids(exchange *x);

/// Refuses a request that was made for another state of the device.
[[nodiscard]] TEE_Result check_dsihash(const exchange &x);

/// Decrypts the request's "content" with the TEE key. `*members` stays the exchange's; it is NULL
/// when the content is no object and the message does not say so.
[[nodiscard]] TEE_Result decrypt_content(exchange *x, const JSON_Object **members);

/// Puts the outcome into the response and hands it out as a text. TEE_SUCCESS when there is a text,
/// be the outcome good or bad.
[[nodiscard]] TEE_Result close_response(exchange *x, TEE_Result result, char **response);

/// A copy of the member `key` of the request, NULL when it has none.
tee_ptr<char> copy_member(const jsmn_object *from, const char *key);

/// Hands `value` over to `into`.
[[nodiscard]] JSON_Status set_owned_value(JSON_Object *into, const char *key, json_ptr *value);

#endif
