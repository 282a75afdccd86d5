// SPDX-License-Identifier: BSD-2-Clause
// otrp-bench-http PROGRAM STATE REQUEST SECONDS: what HTTP adds to an exchange. Turn by turn, sends
// the request of a file to the device through the Client API of this process, and by four clients
// at once to `PROGRAM --state STATE serve`. Exit 1 when a target is missed.
#include <signal.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <string>
#include <thread>
#include <vector>

#include "common/files.h"
#include "device/device_client.h"
#include "device/envelope.h"
#include "http/client.h"

namespace {

using Clock = std::chrono::steady_clock;
using Seconds = std::chrono::duration<double>;

constexpr int kNumRounds = 5;
constexpr int kNumClients = 4;
constexpr double kLeastRate = 0.8;  // of that of the Client API
constexpr double kMostSpread = 5;   // of the 99th percentile over the median

/// Times of exchanges, in seconds, until the time is over.
template <class Exchange>
std::vector<double> repeat(Seconds time, Exchange &&exchange) {
  std::vector<double> times;
  for (const Clock::time_point end = Clock::now() + std::chrono::ceil<Clock::duration>(time);
       Clock::now() < end;) {
    const Clock::time_point begin = Clock::now();
    exchange();
    times.push_back(Seconds(Clock::now() - begin).count());
  }
  return times;
}

size_t exchanges_in_process(const std::string &state, const std::string &request, Seconds time) {
  device::Device device(state);
  device::Session agent(device, device::kAgentUuid);
  const tools::Message &message = device::message_in(request, nullptr);
  const auto exchange = [&] { require_success(message, send(agent, message, request)); };
  exchange();
  return repeat(time, exchange).size();
}

/// A server while the object lives.
class Server {
 public:
  Server(const std::string &program, const std::string &state) {
    int ends[2];
    if (pipe(ends) != 0 || (process_ = fork()) < 0) throw std::runtime_error("no process");
    if (process_ == 0) {
      dup2(ends[1], STDOUT_FILENO);
      close(ends[0]);
      if (freopen("/dev/null", "w", stderr) == nullptr) _exit(1);
      execl(program.c_str(), program.c_str(), "--state", state.c_str(), "serve", "--listen",
            "127.0.0.1:0", nullptr);
      _exit(1);
    }
    close(ends[1]);
    for (char c; read(ends[0], &c, 1) == 1 && c != '\n';) url_ += c;
    close(ends[0]);
  }
  Server(const Server &) = delete;
  Server &operator=(const Server &) = delete;
  ~Server() {
    kill(process_, SIGTERM);
    waitpid(process_, nullptr, 0);
  }
  const std::string &url() const { return url_; }

 private:
  pid_t process_ = -1;
  std::string url_;
};

std::vector<double> exchanges_over_http(const std::string &url, const std::string &request,
                                        Seconds time) {
  const http::Call call = {.method = "POST",
                           .url = url + "/otrp",
                           .headers = {{"Content-Type", "application/otrp+json"}},
                           .body = request};
  std::vector<std::vector<double>> found(kNumClients);
  std::vector<std::jthread> clients;
  for (std::vector<double> &times : found) {
    clients.emplace_back([&times, &call, time] {
      http::Client client;
      times = repeat(time, [&] {
        if (client.send(call).status != 200) {
          fprintf(stderr, "an exchange failed\n");
          exit(1);
        }
      });
    });
  }
  clients.clear();
  std::vector<double> all;
  for (const std::vector<double> &times : found) all.insert(all.end(), times.begin(), times.end());
  return all;
}

double quantile(std::vector<double> values, double part) {
  std::ranges::sort(values);
  return values[static_cast<size_t>(part * static_cast<double>(values.size() - 1))];
}

bool print(const char *name, double figure, const char *limit, double target, bool is_met) {
  printf("%-44s %8.2f   %s %.1f   %s\n", name, figure, limit, target, is_met ? "met" : "MISSED");
  return is_met;
}

int measure(char **words) {
  const std::string state = words[2];
  const std::string request = tools::read_file(words[3]);
  const Seconds time(atof(words[4]) / (2 * kNumRounds));
  std::vector<double> ratios, times;
  for (int i = 0; i < kNumRounds; ++i) {
    const size_t num_in_process = exchanges_in_process(state, request, time);
    const Server server(words[1], state);
    exchanges_over_http(server.url(), request, time / 5);
    const std::vector<double> found = exchanges_over_http(server.url(), request, time);
    const double per_second = 1 / time.count();
    printf("exchanges a second: Client API %.0f, HTTP %.0f\n",
           static_cast<double>(num_in_process) * per_second,
           static_cast<double>(found.size()) * per_second);
    ratios.push_back(static_cast<double>(found.size()) / static_cast<double>(num_in_process));
    times.insert(times.end(), found.begin(), found.end());
  }
  const double median = quantile(times, 0.5);
  const double rate = quantile(ratios, 0.5);
  const double spread = quantile(times, 0.99) / median;
  printf("an exchange of four clients: median %.2f ms, p99 %.2f ms\n\n", median * 1e3,
         spread * median * 1e3);
  const bool is_quick = print("exchanges over HTTP / through the Client API", rate, "at least",
                              kLeastRate, rate >= kLeastRate);
  const bool is_even =
      print("p99 / median", spread, "at most ", kMostSpread, spread <= kMostSpread);
  return is_quick && is_even ? 0 : 1;
}

}  // namespace

int main(int argc, char **argv) {
  if (argc != 5) {
    fprintf(stderr, "usage: otrp-bench-http PROGRAM STATE REQUEST SECONDS\n");
    return 2;
  }
  try {
    return measure(argv);
  } catch (const std::exception &failure) {
    fprintf(stderr, "otrp-bench-http: %s\n", failure.what());
    return 1;
  }
}
