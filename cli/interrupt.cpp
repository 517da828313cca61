#include "cli/interrupt.hpp"

#include <csignal>

namespace sm::cli {
namespace {

volatile std::sig_atomic_t noted = 0;

void note(int /*signal*/) { noted = 1; }

}  // namespace

InterruptWatch::InterruptWatch() {
  noted = 0;
  struct sigaction action {};
  action.sa_handler = note;
  action.sa_flags = static_cast<int>(SA_RESETHAND) | SA_RESTART;
  sigaction(SIGINT, &action, nullptr);
}

InterruptWatch::~InterruptWatch() { std::signal(SIGINT, SIG_DFL); }

bool InterruptWatch::interrupted() { return noted != 0; }

}  // namespace sm::cli
