#include "cli/format.hpp"

#include <fmt/core.h>
#include <sys/resource.h>
#include <unistd.h>

#include <algorithm>
#include <charconv>
#include <fstream>
#include <limits>

namespace sm::cli {

std::string bytes_text(double bytes) {
  constexpr const char* kUnits[] = {"bytes", "KiB", "MiB", "GiB", "TiB", "PiB", "EiB"};
  std::size_t unit = 0;
  while (bytes >= 1024.0 && unit + 1 < std::size(kUnits)) {
    bytes /= 1024.0;
    ++unit;
  }
  return unit == 0 ? fmt::format("{:.0f} bytes", bytes) : fmt::format("{:.1f} {}", bytes, kUnits[unit]);
}

std::string seconds_text(double seconds) { return fmt::format("{:.3f}", seconds); }

std::string number_text(double value) { return fmt::format("{}", value); }

std::string list_text(std::span<const std::int64_t> numbers, std::size_t shown) {
  if (numbers.empty()) return "none";
  std::string text;
  for (const std::int64_t number : numbers.first(std::min(shown, numbers.size()))) {
    text += fmt::format("{}{}", text.empty() ? "" : ", ", number);
  }
  if (numbers.size() > shown) text += fmt::format(", ... ({} more)", numbers.size() - shown);
  return text;
}

std::optional<std::uint64_t> parse_memory(std::string_view text) {
  std::uint64_t value = 0;
  const char* const end = text.data() + text.size();
  const auto [stop, error] = std::from_chars(text.data(), end, value);
  if (error != std::errc() || end - stop > 1 || value == 0) return std::nullopt;
  std::uint64_t unit = 1;
  if (stop != end) {
    constexpr std::string_view kSuffixes = "KMGTkmgt";
    const std::size_t which = kSuffixes.find(*stop);
    if (which == std::string_view::npos) return std::nullopt;
    unit = std::uint64_t{1} << (10 * (which % 4 + 1));
  }
  if (value > static_cast<std::uint64_t>(std::numeric_limits<std::int64_t>::max()) / unit) return std::nullopt;
  return value * unit;
}

std::uint64_t machine_memory() {
  const long pages = sysconf(_SC_PHYS_PAGES);
  const long page = sysconf(_SC_PAGESIZE);
  std::uint64_t memory =
      static_cast<std::uint64_t>(std::max(pages, 0L)) * static_cast<std::uint64_t>(std::max(page, 0L));
  // "max" in the file, or no file, leaves the limit unread.
  std::uint64_t limit = 0;
  if (std::ifstream("/sys/fs/cgroup/memory.max") >> limit && limit > 0) memory = std::min(memory, limit);
  return memory;
}

std::uint64_t peak_resident() {
  rusage usage{};
  getrusage(RUSAGE_SELF, &usage);
  return static_cast<std::uint64_t>(usage.ru_maxrss) * 1024;
}

std::uint64_t resident() {
  std::uint64_t all = 0;
  std::uint64_t pages = 0;
  if (!(std::ifstream("/proc/self/statm") >> all >> pages)) return peak_resident();
  return pages * static_cast<std::uint64_t>(std::max(sysconf(_SC_PAGESIZE), 0L));
}

}  // namespace sm::cli
