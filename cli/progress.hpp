// A line on a terminal that says what a long run is at. Nothing appears in the first half second, nor where standard
// error is no terminal.
#pragma once

#include <atomic>
#include <chrono>
#include <condition_variable>
#include <cstdint>
#include <mutex>
#include <string>
#include <thread>

namespace sm::cli {

// The line is drawn by a thread of its own, as some phases run for long without a chance to report. Everything here is
// called from one other thread.
class Progress {
 public:
  using Milliseconds = std::chrono::milliseconds;

  // Draws on the file descriptor `file` if `enabled`, for the first time after `quiet`, then every `interval`.
  Progress(int file, bool enabled, Milliseconds quiet = Milliseconds(500), Milliseconds interval = Milliseconds(100));
  ~Progress();  // takes the line away
  Progress(const Progress&) = delete;
  Progress& operator=(const Progress&) = delete;

  // Starts a phase: "reading", or "numeric (1.5 Gflop)". Until the first update its share is unknown.
  void phase(std::string name);
  // How long the phase will take, where nothing tells how much of it is done: a bar then follows the clock.
  void expect(double seconds) { expected_.store(seconds, std::memory_order_relaxed); }
  // How much of the phase is done, from 0 to 1. Cheap.
  void update(double fraction) { fraction_.store(fraction, std::memory_order_relaxed); }
  // How far an iteration of unknown length has come. Cheap; a line may show a step with the residual of the next.
  void iteration(std::int64_t step, double residual) {
    residual_.store(residual, std::memory_order_relaxed);
    step_.store(step, std::memory_order_relaxed);
  }
  // A line that stays, above the one that is redrawn; where progress is shown.
  void keep(const std::string& text);

  // The line itself: a bar, or the time so far where the share is unknown (negative).
  static std::string line(const std::string& phase, double fraction, double seconds);
  // The share by the clock: never quite done, as only the next phase can tell; negative without an expectation.
  static double share_by_clock(double seconds, double expected);
  // What is added to it once an iteration runs.
  static std::string iteration_text(std::int64_t step, double residual);

 private:
  void run();
  void draw();

  int file_;
  Milliseconds quiet_;
  Milliseconds interval_;
  std::atomic<double> fraction_{-1.0};
  std::atomic<double> expected_{0.0};  // 0: not known
  std::atomic<double> residual_{0.0};
  std::atomic<std::int64_t> step_{0};  // 0: no iteration runs
  std::mutex mutex_;                   // guards the rest
  std::condition_variable wake_;
  std::string phase_;
  std::chrono::steady_clock::time_point phase_start_;
  bool drawn_ = false;
  bool ended_ = false;
  std::thread thread_;
};

// Whether progress may be shown on a file descriptor: a terminal that can move its cursor.
bool is_capable_terminal(int file);

}  // namespace sm::cli
