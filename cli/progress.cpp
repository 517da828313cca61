#include "cli/progress.hpp"

#include <fmt/core.h>
#include <unistd.h>

#include <algorithm>
#include <cstdlib>
#include <string_view>

namespace sm::cli {
namespace {

constexpr int kBarWidth = 30;
constexpr std::string_view kEraseLine = "\r\x1b[K";

// A terminal that cannot be written to is no reason to stop the work.
void put(int file, std::string_view text) {
  [[maybe_unused]] const ssize_t n = ::write(file, text.data(), text.size());
}

}  // namespace

bool is_capable_terminal(int file) {
  const char* term = std::getenv("TERM");
  return ::isatty(file) == 1 && term && std::string_view(term) != "dumb";
}

Progress::Progress(int file, bool enabled, Milliseconds quiet, Milliseconds interval)
    : file_(file), quiet_(quiet), interval_(interval), phase_start_(std::chrono::steady_clock::now()) {
  if (enabled) thread_ = std::thread([this] { run(); });
}

Progress::~Progress() {
  if (!thread_.joinable()) return;
  {
    const std::lock_guard lock(mutex_);
    ended_ = true;
  }
  wake_.notify_one();
  thread_.join();
  if (drawn_) put(file_, kEraseLine);
}

void Progress::phase(std::string name) {
  if (!thread_.joinable()) return;
  const std::lock_guard lock(mutex_);
  phase_ = std::move(name);
  phase_start_ = std::chrono::steady_clock::now();
  update(-1.0);
  expect(0.0);
  iteration(0, 0.0);
}

void Progress::keep(const std::string& text) {
  if (!thread_.joinable()) return;
  const std::lock_guard lock(mutex_);
  put(file_, std::string(kEraseLine) + text + "\n");
}

std::string Progress::line(const std::string& phase, double fraction, double seconds) {
  if (fraction < 0.0) return fmt::format("{} ... {:.0f} s", phase, seconds);
  const double share = std::min(fraction, 1.0);
  const int full = static_cast<int>(share * kBarWidth);
  return fmt::format("{} [{:#>{}}{:.>{}}] {:3.0f} %", phase, "", full, "", kBarWidth - full, 100.0 * share);
}

double Progress::share_by_clock(double seconds, double expected) {
  return expected > 0.0 ? std::min(seconds / expected, 0.99) : -1.0;
}

std::string Progress::iteration_text(std::int64_t step, double residual) {
  return step > 0 ? fmt::format(", step {}, residual {:.2e}", step, residual) : "";
}

void Progress::run() {
  std::unique_lock lock(mutex_);
  Milliseconds pause = quiet_;
  while (!wake_.wait_for(lock, pause, [this] { return ended_; })) {
    draw();
    pause = interval_;
  }
}

void Progress::draw() {
  if (phase_.empty()) return;
  const std::chrono::duration<double> seconds = std::chrono::steady_clock::now() - phase_start_;
  const double told = fraction_.load(std::memory_order_relaxed);
  const double share = told < 0.0 ? share_by_clock(seconds.count(), expected_.load(std::memory_order_relaxed)) : told;
  put(file_, std::string(kEraseLine) + line(phase_, share, seconds.count()) +
                 iteration_text(step_.load(std::memory_order_relaxed), residual_.load(std::memory_order_relaxed)));
  drawn_ = true;
}

}  // namespace sm::cli
