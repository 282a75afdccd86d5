// SPDX-License-Identifier: BSD-2-Clause
/// What a server asks for answers.
#ifndef HTTP_HANDLER_H
#define HTTP_HANDLER_H

#include <optional>

#include "http/message.h"

namespace http {

class Handler {
 public:
  virtual ~Handler() = default;

  /// What the head alone decides, its body being unread: a refusal, or something that is known
  /// anyway. Called where all connections are served, so it must not wait for anything, and may run
  /// beside answer(). Where a body was announced, the connection ends with the answer.
  virtual std::optional<Answer> answer_early(const Request &head) = 0;

  /// Called by a worker, and may take its time; with several workers, by several at once. What it
  /// throws becomes a status of 500.
  virtual Answer answer(const Request &request) = 0;
};

}  // namespace http

#endif
