// SPDX-License-Identifier: BSD-2-Clause
// client_probe CA_FILE URL BODY...: GETs the URL, then POSTs each body to it, all with one client;
// a line for each outcome.
#include <cstdio>

#include "http/client.h"

int main(int, char **argv) {
  using std::chrono::milliseconds;
  const auto report = [&](http::Client &client, const http::Call &call) {
    try {
      const http::Reply reply = client.send(call);
      const std::string *type = http::find_header(reply.headers, "content-TYPE");
      printf("%d %s %s\n", reply.status, type ? type->c_str() : "-", reply.body.c_str());
    } catch (const http::ClientError &error) {
      printf("failure %d %s\n", static_cast<int>(error.failure()), error.what());
    } catch (const std::exception &error) {
      printf("error %s\n", error.what());
    }
  };
  http::Client client({.ca_file = argv[1], .total_time = milliseconds(1500), .max_body_len = 1000});
  report(client, {.url = argv[2], .headers = {{"Authorization", "secret"}}});
  for (char **body = argv + 3; *body != nullptr; ++body) {
    report(client, {.method = "POST", .url = argv[2], .headers = {{"X-Empty", ""}}, .body = *body});
  }
}
