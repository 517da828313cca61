// Standard input, output and error: what goes where, and what happens when nobody listens.
#include <fcntl.h>
#include <poll.h>
#include <pty.h>
#include <unistd.h>

#include <array>
#include <atomic>
#include <filesystem>
#include <thread>

#include "cli/command.hpp"

namespace sm::test {
namespace {

using StandardStreams = CommandTest;

TEST_F(StandardStreams, a_dash_stands_for_standard_input) {
  const Outcome run = qxsm({"factor", "-"}, {.input = read(shipped("bcsstk01.mtx"))});
  ASSERT_EQ(run.code, 0) << run.err;
  EXPECT_EQ(run.fact("matrix"), "standard input (coordinate real symmetric)");
  EXPECT_EQ(run.fact("rank"), "48 of 48");
  expect_message(qxsm({"info", "-"}, {.input = "nonsense\n"}), 2, {"standard input:1: found \"nonsense\"", "; check"});
}

TEST_F(StandardStreams, right_hand_sides_may_come_from_standard_input) {
  const Outcome run = qxsm({"solve", shipped("bcsstk01.mtx"), "-b", "-"}, {.input = read(shipped("bcsstk01_b.mtx"))});
  ASSERT_EQ(run.code, 0) << run.err;
  EXPECT_EQ(run.fact("relative residual 2").substr(0, 1).find_first_not_of("0123456789"), std::string::npos);
}

TEST_F(StandardStreams, a_solution_on_standard_output_sends_the_report_to_standard_error) {
  const std::string x = path("x.mtx");
  ASSERT_EQ(qxsm({"solve", shipped("bcsstk01.mtx"), "-o", x}).code, 0);
  const Outcome run = qxsm({"solve", shipped("bcsstk01.mtx"), "-o", "-"});
  EXPECT_EQ(run.code, 0);
  EXPECT_EQ(run.out, read(x));
  EXPECT_NE(run.err.find("rank               48 of 48"), std::string::npos) << run.err;
  EXPECT_EQ(qxsm({"solve", shipped("bcsstk01.mtx"), "-o", "-", "--quiet"}).err, "");
}

TEST_F(StandardStreams, quiet_leaves_errors_and_the_exit_code) {
  for (const char* command : {"info", "factor", "solve"}) {
    const Outcome good = qxsm({command, shipped("bcsstk01.mtx"), "--quiet"});
    EXPECT_EQ(good.code, 0);
    EXPECT_EQ(good.out + good.err, "");
    expect_message(qxsm({command, path("no.mtx"), "--quiet"}), 2, {"cannot be opened"});
  }
  EXPECT_EQ(qxsm({"factor", shipped("bcsstk01.mtx"), "--quiet", "--json"}).json().at("rank"), 48);
}

TEST_F(StandardStreams, output_that_cannot_be_written_ends_with_2) {
  if (!std::filesystem::exists("/dev/full")) GTEST_SKIP() << "no /dev/full here";
  for (const char* option : {"--json", "--memory=1G"}) {
    const Outcome run = qxsm({"info", shipped("bcsstk01.mtx"), option}, {.out = "/dev/full"});
    expect_message(run, 2, {"standard output: cannot be written (No space left on device)", "; check the free space"});
  }
  expect_message(qxsm({"solve", shipped("bcsstk01.mtx"), "-o", "/dev/full"}), 2,
                 {"/dev/full: cannot be written", "; check"});
  expect_message(qxsm({"grid", "300", "300"}, {.out = "/dev/full"}), 2,
                 {"standard output: cannot be written", "; check"});
}

TEST_F(StandardStreams, a_reader_that_went_away_ends_with_2) {
  std::array<int, 2> ends{};
  ASSERT_EQ(pipe(ends.data()), 0);
  close(ends[0]);
  const Outcome run = qxsm({"grid", "300", "300"}, {.out_file = ends[1]});
  expect_message(run, 2, {"standard output: cannot be written (Broken pipe)", "; check"});
  close(ends[1]);
}

TEST_F(StandardStreams, a_long_run_shows_its_phase_on_a_terminal_and_takes_it_away) {
  int terminal = -1;
  int program_side = -1;
  ASSERT_EQ(openpty(&terminal, &program_side, nullptr, nullptr, nullptr), 0);
  std::array<int, 2> input{};
  ASSERT_EQ(pipe2(input.data(), O_CLOEXEC), 0);
  std::string screen;
  // Holds the input back until the program has said that it is reading.
  std::thread user([&] {
    const std::string text = read(shipped("bcsstk01.mtx"));
    EXPECT_EQ(write(input[1], text.data(), 100), 100);
    std::array<char, 256> buffer{};
    while (screen.find("reading ... ") == std::string::npos) {
      const ssize_t got = ::read(terminal, buffer.data(), buffer.size());
      if (got <= 0) break;
      screen.append(buffer.data(), static_cast<std::size_t>(got));
    }
    EXPECT_EQ(write(input[1], text.data() + 100, text.size() - 100), static_cast<ssize_t>(text.size() - 100));
    close(input[1]);
  });
  const Outcome run = qxsm({"factor", "-"}, {.in_file = input[0], .err_file = program_side, .terminal = "xterm"});
  user.join();
  fcntl(terminal, F_SETFL, O_NONBLOCK);
  std::array<char, 4096> rest{};
  const ssize_t got = ::read(terminal, rest.data(), rest.size());
  if (got > 0) screen.append(rest.data(), static_cast<std::size_t>(got));
  EXPECT_EQ(run.code, 0);
  EXPECT_NE(screen.find("reading ... "), std::string::npos);
  EXPECT_EQ(screen.substr(screen.size() - 4), "\r\x1b[K");
  EXPECT_EQ(run.out.find('\x1b'), std::string::npos);
  for (const int file : {terminal, program_side, input[0]}) close(file);
}

// What a run shows on a terminal, which is read all the while.
std::string screen_of(const std::vector<std::string>& arguments, Outcome& run) {
  int terminal = -1;
  int program_side = -1;
  EXPECT_EQ(openpty(&terminal, &program_side, nullptr, nullptr, nullptr), 0);
  std::string screen;
  std::atomic<bool> ended{false};
  std::thread user([&] {
    std::array<char, 4096> buffer{};
    pollfd ready{.fd = terminal, .events = POLLIN, .revents = 0};
    for (bool last = false; !last;) {
      last = ended;
      while (poll(&ready, 1, 20) > 0) {
        const ssize_t got = ::read(terminal, buffer.data(), buffer.size());
        if (got <= 0) break;
        screen.append(buffer.data(), static_cast<std::size_t>(got));
      }
    }
  });
  run = qxsm(arguments, {.err_file = program_side, .terminal = "xterm"});
  ended = true;
  user.join();
  for (const int file : {terminal, program_side}) close(file);
  return screen;
}

// The line appears after half a second. How many steps that takes depends on the machine; a tolerance of 0 is not met.
TEST_F(StandardStreams, conjugate_gradients_show_their_residual_on_a_terminal) {
  std::string screen;
  for (long steps = 1000; steps < 4'000'000 && screen.find(" s, step ") == std::string::npos; steps *= 2) {
    Outcome run;
    screen = screen_of({"solve", shipped("bcsstk13.mtx"), "--method", "cg", "--tolerance", "0", "--json",
                        "--max-iterations", std::to_string(steps)},
                       run);
    ASSERT_EQ(run.code, 1);
    EXPECT_EQ(run.json().at("iterations"), steps);
    EXPECT_EQ(run.out.find('\x1b'), std::string::npos);
  }
  const std::size_t line = screen.find("conjugate gradients ... ");
  ASSERT_NE(line, std::string::npos) << screen;
  const std::size_t step = screen.find(" s, step ", line);
  ASSERT_NE(step, std::string::npos) << screen;
  EXPECT_EQ(screen.find(", residual ", step), screen.find_first_not_of("0123456789", step + 9)) << screen;
}

TEST_F(StandardStreams, nothing_but_messages_goes_to_a_standard_error_that_is_no_terminal) {
  const std::string grid = path("grid.mtx");
  ASSERT_EQ(qxsm({"grid", "400", "400", "-o", grid}).code, 0);
  const Outcome run = qxsm({"factor", grid}, {.terminal = "xterm"});
  EXPECT_EQ(run.code, 0);
  EXPECT_EQ(run.err, "");
}

}  // namespace
}  // namespace sm::test
