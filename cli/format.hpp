// Numbers as people read them, and the one number that people write: a size of memory.
#pragma once

#include <cstdint>
#include <optional>
#include <span>
#include <string>
#include <string_view>

namespace sm::cli {

std::string bytes_text(double bytes);      // "1.5 GiB"
std::string seconds_text(double seconds);  // three digits behind the point
std::string number_text(double value);     // shortest text that reads back as the same number

// "3, 4, 5, ... (97 more)": at most `shown` of them; "none" when there are none.
std::string list_text(std::span<const std::int64_t> numbers, std::size_t shown = 10);

// "4G", "512m", "1048576": bytes with a suffix K, M, G or T in powers of 1024. Nothing for any other text, for 0 and
// for what does not fit into 63 bits.
std::optional<std::uint64_t> parse_memory(std::string_view text);

// The memory that this process can hope for: what the machine has, or the limit of its control group when that is less.
std::uint64_t machine_memory();

// The largest resident size of this process so far, in bytes.
std::uint64_t peak_resident();

// What of it is resident now; the largest so far where the system does not tell.
std::uint64_t resident();

}  // namespace sm::cli
