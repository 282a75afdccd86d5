// SPDX-License-Identifier: BSD-2-Clause
#include "http/client.h"

#include <curl/curl.h>
#include <unistd.h>

#include <algorithm>
#include <cstdlib>
#include <limits>
#include <utility>

#include "common/error_line.h"

namespace http {
namespace {

using Clock = std::chrono::steady_clock;
using std::chrono::milliseconds;

struct CurlFree {
  void operator()(CURL *curl) const { curl_easy_cleanup(curl); }
  void operator()(CURLU *url) const { curl_url_cleanup(url); }
  void operator()(curl_slist *list) const { curl_slist_free_all(list); }
  void operator()(char *text) const { curl_free(text); }
};
template <class T>
using Owned = std::unique_ptr<T, CurlFree>;

/// curl_easy_setopt takes arguments of any type, so the compiler cannot see a wrong one: callers
/// give long, pointer, curl_off_t or function, as each option wants it.
template <class Value>
void set(CURL *curl, CURLoption option, Value value) {
  if (curl_easy_setopt(curl, option, value) != CURLE_OK) {
    throw std::runtime_error("libcurl lacks option " + std::to_string(option));
  }
}

template <class Value>
Value get(CURL *curl, CURLINFO info) {
  Value value{};
  curl_easy_getinfo(curl, info, &value);
  return value;
}

// ---- URLs

struct Origin {
  std::string scheme, host, port;
  bool operator==(const Origin &) const = default;
};

std::string part_of(CURLU *url, CURLUPart part, unsigned flags = 0) {
  char *text = nullptr;
  if (curl_url_get(url, part, &text, flags) != CURLUE_OK) return "";
  return Owned<char>(text).get();
}

Origin origin_of(const std::string &text) {
  const Owned<CURLU> url(curl_url());
  if (curl_url_set(url.get(), CURLUPART_URL, text.c_str(), 0) != CURLUE_OK) return {};
  return {part_of(url.get(), CURLUPART_SCHEME), part_of(url.get(), CURLUPART_HOST),
          part_of(url.get(), CURLUPART_PORT, CURLU_DEFAULT_PORT)};
}

bool is_http(const Origin &origin) {
  return origin.scheme == "http" || origin.scheme == "https";
}

// ---- What an answer is collected in

struct Incoming {
  const ClientOptions &limits;
  Reply reply = {};
  size_t header_len = 0;
  bool is_too_large = false;
};

std::string_view trim(std::string_view text) {
  const size_t first = text.find_first_not_of(" \t\r\n");
  if (first == std::string_view::npos) return {};
  return text.substr(first, text.find_last_not_of(" \t\r\n") - first + 1);
}

/// A status line begins an answer anew: one with a status of 1xx may stand before it.
size_t take_header(const char *bytes, size_t, size_t len, void *user) {
  auto &incoming = *static_cast<Incoming *>(user);
  incoming.header_len += len;
  incoming.is_too_large = incoming.header_len > incoming.limits.max_header_len;
  if (incoming.is_too_large) return 0;
  const std::string_view line(bytes, len);
  const size_t colon = line.find(':');
  if (line.starts_with("HTTP/")) {
    incoming.reply.headers.clear();
  } else if (colon != std::string_view::npos) {
    incoming.reply.headers.push_back(
        {std::string(line.substr(0, colon)), std::string(trim(line.substr(colon + 1)))});
  }
  return len;
}

size_t take_body(const char *bytes, size_t, size_t len, void *user) {
  auto &incoming = *static_cast<Incoming *>(user);
  incoming.is_too_large = len > incoming.limits.max_body_len - incoming.reply.body.size();
  if (incoming.is_too_large) return 0;
  incoming.reply.body.append(bytes, len);
  return len;
}

/// Gives a body away once: what cannot be read again is not sent again on another connection.
size_t give_body(char *to, size_t, size_t room, void *user) {
  auto &left = *static_cast<std::string_view *>(user);
  const size_t len = left.copy(to, room);
  left.remove_prefix(len);
  return len;
}

// ---- Failures

Failure failure_of(CURLcode code) {
  switch (code) {
    case CURLE_COULDNT_RESOLVE_PROXY:
    case CURLE_COULDNT_RESOLVE_HOST:
    case CURLE_COULDNT_CONNECT:
    case CURLE_PROXY:
      return Failure::kNoConnection;
    case CURLE_SSL_CONNECT_ERROR:
    case CURLE_SSL_CERTPROBLEM:
    case CURLE_SSL_CIPHER:
    case CURLE_SSL_ISSUER_ERROR:
    case CURLE_PEER_FAILED_VERIFICATION:
      return Failure::kTls;
    case CURLE_OPERATION_TIMEDOUT:
      return Failure::kTimeout;
    default:
      return Failure::kLost;
  }
}

const char *text_of(Failure failure) {
  switch (failure) {
    case Failure::kNoConnection:
      return "no connection";
    case Failure::kTls:
      return "no TLS connection that can be trusted";
    case Failure::kTimeout:
      return "no answer in time";
    case Failure::kLost:
      return "no whole answer";
    case Failure::kTooLarge:
      return "the answer is too long";
    case Failure::kRedirect:
      return "the redirect is not followed";
  }
  return "failed";
}

ClientError error(Failure failure, const std::string &url, const std::string &reason) {
  return {failure, url + ": " + text_of(failure) + ": " + reason};
}

// ---- Requests

/// Whether a redirect may carry a header along to another host.
bool is_for_one_host(const Header &header) {
  return same_word(header.name, "Authorization") || same_word(header.name, "Cookie");
}

/// A header without a value keeps libcurl from sending what it would by itself.
Owned<curl_slist> header_list(const Headers &headers) {
  Owned<curl_slist> list;
  const auto append = [&](const std::string &line) {
    if (line.find_first_of(std::string_view("\r\n\0", 3)) != std::string::npos) {
      throw tools::UsageError("bad HTTP header: expected a text of one line");
    }
    list.reset(curl_slist_append(list.release(), line.c_str()));
  };
  append("Expect:");
  if (find_header(headers, "Content-Type") == nullptr) append("Content-Type:");
  for (const Header &header : headers) {
    append(header.name + (header.value.empty() ? ";" : ": " + header.value));
  }
  return list;
}

bool is_redirect(int status) {
  return status == 301 || status == 302 || status == 303 || status == 307 || status == 308;
}

/// The call that a redirect asks for.
Call redirected(const Call &call, int status, const std::string &url) {
  Call next = call;
  next.url = url;
  if (status != 307 && status != 308 && call.method != "HEAD") {
    next.method = "GET";
    next.body.clear();
    std::erase_if(next.headers,
                  [](const Header &header) { return same_word(header.name, "Content-Type"); });
  }
  if (origin_of(url) != origin_of(call.url)) std::erase_if(next.headers, is_for_one_host);
  return next;
}

}  // namespace

struct Client::Handle {
  Owned<CURL> curl;
  std::string no_proxy;
  char reason[CURL_ERROR_SIZE] = "";

  Handle();
  void configure(const ClientOptions &options);
  void set_method(const Call &call);
  Reply send_once(const Call &call, const ClientOptions &options, milliseconds time);
};

Client::Handle::Handle() {
  static const CURLcode ready = curl_global_init(CURL_GLOBAL_DEFAULT);
  if (ready == CURLE_OK) curl.reset(curl_easy_init());
  if (!curl) throw std::runtime_error("libcurl cannot be used");
  const char *elsewhere = getenv("no_proxy");
  no_proxy = "localhost,127.0.0.0/8,::1";
  if (elsewhere != nullptr && *elsewhere != '\0') no_proxy += std::string(",") + elsewhere;
}

void Client::Handle::configure(const ClientOptions &options) {
  curl_easy_reset(curl.get());  // keeps connections
  set(curl.get(), CURLOPT_ERRORBUFFER, reason);
  set(curl.get(), CURLOPT_NOSIGNAL, 1L);
  set(curl.get(), CURLOPT_PROTOCOLS_STR, "http,https");
  set(curl.get(), CURLOPT_NOPROXY, no_proxy.c_str());
  set(curl.get(), CURLOPT_SSLVERSION, static_cast<long>(CURL_SSLVERSION_TLSv1_2));
  set(curl.get(), CURLOPT_USERAGENT, options.user_agent.c_str());
  set(curl.get(), CURLOPT_CONNECTTIMEOUT_MS, static_cast<long>(options.connect_time.count()));
  if (options.ca_file.empty()) return;
  set(curl.get(), CURLOPT_CAINFO, options.ca_file.c_str());
  set(curl.get(), CURLOPT_CAPATH, nullptr);
}

void Client::Handle::set_method(const Call &call) {
  if (call.method == "HEAD") return set(curl.get(), CURLOPT_NOBODY, 1L);
  if (!call.body.empty() || call.method == "POST" || call.method == "PUT") {
    set(curl.get(), CURLOPT_POST, 1L);
    set(curl.get(), CURLOPT_POSTFIELDSIZE_LARGE, static_cast<curl_off_t>(call.body.size()));
  }
  set(curl.get(), CURLOPT_CUSTOMREQUEST, call.method.c_str());
}

Reply Client::Handle::send_once(const Call &call, const ClientOptions &options, milliseconds time) {
  if (!is_http(origin_of(call.url))) {
    throw tools::UsageError("bad URL \"" + call.url + "\": expected http://... or https://...");
  }
  configure(options);
  set_method(call);
  Incoming incoming{options};
  std::string_view outgoing = call.body;
  const Owned<curl_slist> headers = header_list(call.headers);
  set(curl.get(), CURLOPT_URL, call.url.c_str());
  set(curl.get(), CURLOPT_TIMEOUT_MS, static_cast<long>(time.count()));
  set(curl.get(), CURLOPT_HTTPHEADER, headers.get());
  set(curl.get(), CURLOPT_HEADERFUNCTION, take_header);
  set(curl.get(), CURLOPT_HEADERDATA, &incoming);
  set(curl.get(), CURLOPT_WRITEFUNCTION, take_body);
  set(curl.get(), CURLOPT_WRITEDATA, &incoming);
  set(curl.get(), CURLOPT_READFUNCTION, give_body);
  set(curl.get(), CURLOPT_READDATA, &outgoing);

  *reason = '\0';
  const CURLcode code = curl_easy_perform(curl.get());
  if (code == CURLE_SSL_CACERT_BADFILE) {
    throw tools::UsageError("bad CA file " + options.ca_file + ": expected PEM certificates");
  }
  if (incoming.is_too_large) {
    throw error(Failure::kTooLarge, call.url,
                "expected at most " + std::to_string(options.max_body_len) + " bytes, and " +
                    std::to_string(options.max_header_len) + " of headers");
  }
  if (code != CURLE_OK) {
    throw error(failure_of(code), call.url, *reason != '\0' ? reason : curl_easy_strerror(code));
  }
  incoming.reply.status = static_cast<int>(get<long>(curl.get(), CURLINFO_RESPONSE_CODE));
  incoming.reply.url = call.url;
  return std::move(incoming.reply);
}

Client::Client(ClientOptions options)
    : handle_(std::make_unique<Handle>()), options_(std::move(options)) {
  if (!options_.ca_file.empty() && access(options_.ca_file.c_str(), R_OK) != 0) {
    throw tools::UsageError("cannot read the CA file " + options_.ca_file);
  }
}

Client::~Client() = default;
Client::Client(Client &&other) noexcept = default;
Client &Client::operator=(Client &&other) noexcept = default;

Reply Client::send(const Call &call) {
  const Clock::time_point deadline = Clock::now() + options_.total_time;
  Call next = call;
  for (int num_redirects = 0;; ++num_redirects) {
    const auto left = std::chrono::ceil<milliseconds>(deadline - Clock::now());
    if (left <= milliseconds(0)) throw error(Failure::kTimeout, next.url, "too many redirects");
    Reply reply = handle_->send_once(next, options_, left);

    const char *target = get<char *>(handle_->curl.get(), CURLINFO_REDIRECT_URL);
    if (!is_redirect(reply.status) || target == nullptr) return reply;
    if (num_redirects == options_.max_redirects) {
      throw error(Failure::kRedirect, next.url, "it is one too many");
    }
    const Origin to = origin_of(target);
    if (!is_http(to) || (origin_of(next.url).scheme == "https" && to.scheme == "http")) {
      throw error(Failure::kRedirect, next.url,
                  "expected one to " + origin_of(next.url).scheme + ", got " + target);
    }
    next = redirected(next, reply.status, target);
  }
}

}  // namespace http
