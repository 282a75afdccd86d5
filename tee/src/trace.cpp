// SPDX-License-Identifier: BSD-2-Clause
#include <sys/syscall.h>
#include <tee_inspect.h>
#include <tee_test.h>
#include <tee_trace.h>
#include <unistd.h>

#include <cstdarg>
#include <cstdio>
#include <mutex>

#include "ta_instance.h"

namespace tee {

struct test::TraceSink::Impl {
  std::vector<Line> lines;
};

namespace {

// Outside a trusted application, which only tests of its functions do.
constexpr char kNoPrefix[] = "TEE";

std::mutex g_sinks_lock;
std::vector<test::TraceSink::Impl *> g_sinks;  // innermost last

// Where this thread's lines go, but for a sink; NULL: standard error.
thread_local void (*t_take)(void *closure, const char *line, size_t len);
thread_local void *t_closure;

const char *tag_of(int level) {
  switch (level) {
    case TEE_TRACE_ALWAYS:
      return "MSG";
    case TEE_TRACE_ERROR:
      return "ERR";
    case TEE_TRACE_INFO:
      return "INF";
    case TEE_TRACE_DEBUG:
      return "DBG";
    case TEE_TRACE_FLOW:
      return "FLW";
    default:
      return "UKN";
  }
}

bool appears(int level) {
  const Running *running = Running::now();
  const uint32_t highest =
      running != nullptr ? running->instance().program.trace_level : TEE_TRACE_ERROR;
  return level == TEE_TRACE_ALWAYS || (level > 0 && static_cast<uint32_t>(level) <= highest);
}

__attribute__((format(printf, 1, 0))) std::string formatted(const char *format, va_list args) {
  va_list again;
  va_copy(again, args);
  const int len = std::vsnprintf(nullptr, 0, format, again);
  va_end(again);
  if (len < 0) return format;
  std::string text(static_cast<size_t>(len), '\0');
  std::vsnprintf(text.data(), text.size() + 1, format, args);
  if (text.ends_with('\n')) text.pop_back();
  return text;
}

void print(const char *tag, const char *function, int line, const std::string &message) {
  static thread_local const long thread = ::syscall(SYS_gettid);
  const Running *running = Running::now();
  char where[256];
  std::snprintf(where, sizeof(where), "%s [0x%lx] %s:%s:%d: ", tag, thread,
                running != nullptr ? running->instance().program.trace_prefix.c_str() : kNoPrefix,
                function, line);
  const std::string text = where + message + '\n';
  if (t_take != nullptr) return t_take(t_closure, text.data(), text.size());
  // One write, so that lines of several threads and processes do not mix.
  [[maybe_unused]] const ssize_t written = ::write(STDERR_FILENO, text.data(), text.size());
}

// Texts come from outside, too: a line break would let one pass for another line, an escape
// sequence speak to the terminal.
std::string without_controls(const std::string &message) {
  std::string text;
  for (const char c : message) {
    if (static_cast<unsigned char>(c) >= 0x20 && c != 0x7F) {
      text += c;
    } else {
      char escaped[5];
      std::snprintf(escaped, sizeof(escaped), "\\x%02x", static_cast<unsigned char>(c));
      text += escaped;
    }
  }
  return text;
}

void log(const char *function, int line, int level, std::string message) {
  {
    const std::lock_guard guard(g_sinks_lock);
    if (!g_sinks.empty()) {
      g_sinks.back()->lines.push_back({tag_of(level), function, std::move(message)});
      return;
    }
  }
  print(tag_of(level), function, line, without_controls(message));
}

}  // namespace

test::TraceSink::TraceSink() : impl_(std::make_unique<Impl>()) {
  const std::lock_guard guard(g_sinks_lock);
  g_sinks.push_back(impl_.get());
}

test::TraceSink::~TraceSink() {
  const std::lock_guard guard(g_sinks_lock);
  std::erase(g_sinks, impl_.get());
}

const std::vector<test::TraceSink::Line> &test::TraceSink::lines() const {
  return impl_->lines;
}

void test::TraceSink::clear() {
  const std::lock_guard guard(g_sinks_lock);
  impl_->lines.clear();
}

}  // namespace tee

using namespace tee;

void tee_trace(const char *function, int line, int level, const char *format, ...) {
  if (!appears(level)) return;
  va_list args;
  va_start(args, format);
  try {
    log(function, line, level, formatted(format, args));
  } catch (const std::bad_alloc &) {
    // A line is lost; the trusted application goes on.
  }
  va_end(args);
}

void tee_inspect_trace(void (*take)(void *closure, const char *line, size_t len), void *closure) {
  t_take = take;
  t_closure = closure;
}
