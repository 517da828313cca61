#include "cli/progress.hpp"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include <array>

namespace sm::cli {
namespace {

using Milliseconds = Progress::Milliseconds;

// The reading end of a pipe that progress is drawn into.
class Screen {
 public:
  Screen() {
    EXPECT_EQ(pipe(ends_.data()), 0);
    fcntl(ends_[0], F_SETFL, O_NONBLOCK);
  }
  ~Screen() {
    close(ends_[0]);
    close(ends_[1]);
  }
  int file() const { return ends_[1]; }
  std::string text() {
    std::array<char, 4096> buffer{};
    for (ssize_t got = read(ends_[0], buffer.data(), buffer.size()); got > 0;
         got = read(ends_[0], buffer.data(), buffer.size())) {
      text_.append(buffer.data(), static_cast<std::size_t>(got));
    }
    return text_;
  }
  // Whether the text appears before ten seconds are over.
  bool shows(const std::string& wanted) {
    for (int tries = 0; tries < 2000; ++tries) {
      if (text().find(wanted) != std::string::npos) return true;
      std::this_thread::sleep_for(Milliseconds(5));
    }
    return false;
  }

 private:
  std::array<int, 2> ends_{};
  std::string text_;
};

TEST(Progress, a_known_share_is_a_bar_and_an_unknown_one_a_clock) {
  EXPECT_EQ(Progress::line("reading", 0.0, 1.0), "reading [..............................]   0 %");
  EXPECT_EQ(Progress::line("reading", 0.5, 1.0), "reading [###############...............]  50 %");
  EXPECT_EQ(Progress::line("reading", 1.0, 1.0), "reading [##############################] 100 %");
  EXPECT_EQ(Progress::line("reading", 7.0, 1.0), "reading [##############################] 100 %");
  EXPECT_EQ(Progress::line("ordering", -1.0, 12.3), "ordering ... 12 s");
}

TEST(Progress, an_iteration_shows_its_step_and_its_residual_until_the_phase_ends) {
  EXPECT_EQ(Progress::iteration_text(0, 0.5), "");
  EXPECT_EQ(Progress::iteration_text(57, 3.25e-5), ", step 57, residual 3.25e-05");
  Screen screen;
  {
    Progress progress(screen.file(), true, Milliseconds(1), Milliseconds(1));
    progress.phase("conjugate gradients");
    progress.iteration(3, 0.25);
    EXPECT_TRUE(screen.shows("\r\x1b[Kconjugate gradients ... 0 s, step 3, residual 2.50e-01"));
    progress.phase("writing");
    EXPECT_TRUE(screen.shows("\r\x1b[Kwriting ... 0 s\r"));
  }
}

TEST(Progress, a_long_phase_is_drawn_and_the_line_is_taken_away_at_the_end) {
  Screen screen;
  {
    Progress progress(screen.file(), true, Milliseconds(1), Milliseconds(1));
    progress.phase("ordering");
    EXPECT_TRUE(screen.shows("\r\x1b[Kordering ... 0 s"));
    progress.phase("solving");
    progress.update(0.5);
    EXPECT_TRUE(screen.shows("solving [###############...............]  50 %"));
  }
  const std::string text = screen.text();
  EXPECT_EQ(text.substr(text.size() - 4), "\r\x1b[K");
}

TEST(Progress, a_short_run_shows_nothing) {
  Screen screen;
  {
    Progress progress(screen.file(), true, Milliseconds(60'000));
    progress.phase("reading");
    progress.update(0.5);
  }
  EXPECT_EQ(screen.text(), "");
}

TEST(Progress, nothing_is_drawn_when_it_is_not_wanted) {
  Screen screen;
  {
    Progress progress(screen.file(), false, Milliseconds(0), Milliseconds(1));
    progress.phase("reading");
    progress.update(0.5);
    std::this_thread::sleep_for(Milliseconds(20));
  }
  EXPECT_EQ(screen.text(), "");
}

TEST(Progress, a_pipe_is_no_capable_terminal) {
  Screen screen;
  EXPECT_FALSE(is_capable_terminal(screen.file()));
}

}  // namespace
}  // namespace sm::cli
