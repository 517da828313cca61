#include "cli/format.hpp"

#include <gtest/gtest.h>

#include <vector>

namespace sm::cli {
namespace {

TEST(Format, memory_sizes_have_suffixes_in_powers_of_1024) {
  EXPECT_EQ(parse_memory("1"), 1u);
  EXPECT_EQ(parse_memory("10M"), 10u * 1024 * 1024);
  EXPECT_EQ(parse_memory("3k"), 3u * 1024);
  EXPECT_EQ(parse_memory("4G"), std::uint64_t{4} << 30);
  EXPECT_EQ(parse_memory("2t"), std::uint64_t{2} << 40);
  EXPECT_EQ(parse_memory("8388607T"), std::uint64_t{8388607} << 40);
}

TEST(Format, other_texts_are_no_memory_sizes) {
  for (const char* bad :
       {"", "0", "0G", "-1", "+1", "1.5G", "G", "4GB", "4 G", "4Q", "8388608T", "99999999999999999999"}) {
    EXPECT_FALSE(parse_memory(bad)) << bad;
  }
}

TEST(Format, bytes_are_given_in_the_unit_that_fits) {
  EXPECT_EQ(bytes_text(0), "0 bytes");
  EXPECT_EQ(bytes_text(1023), "1023 bytes");
  EXPECT_EQ(bytes_text(1024), "1.0 KiB");
  EXPECT_EQ(bytes_text(1.5 * 1024 * 1024), "1.5 MiB");
  EXPECT_EQ(bytes_text(3.0 * 1024 * 1024 * 1024), "3.0 GiB");
}

TEST(Format, long_lists_are_cut) {
  EXPECT_EQ(list_text({}), "none");
  const std::vector<std::int64_t> numbers{1, 2, 3, 4};
  EXPECT_EQ(list_text(numbers, 4), "1, 2, 3, 4");
  EXPECT_EQ(list_text(numbers, 2), "1, 2, ... (2 more)");
}

TEST(Format, numbers_read_back_as_they_were) {
  for (const double value : {0.1, 1e300, -2.5, 38330.04461650225}) EXPECT_EQ(std::stod(number_text(value)), value);
}

TEST(Format, the_machine_has_memory_and_this_process_uses_some) {
  EXPECT_GT(machine_memory(), std::uint64_t{1} << 26);
  EXPECT_GT(peak_resident(), std::uint64_t{1} << 18);
  EXPECT_LT(peak_resident(), std::uint64_t{1} << 40);
}

}  // namespace
}  // namespace sm::cli
