#include "cli/bytes.hpp"

#include <gtest/gtest.h>

#include <fstream>

#include "cli/reading.hpp"

namespace sm::test {
namespace {

std::string drain(cli::ByteSource& source, std::size_t step = 7) {
  std::string all;
  std::string buffer(step, '\0');
  for (std::size_t got = source.read(buffer.data(), step); got > 0; got = source.read(buffer.data(), step)) {
    all.append(buffer, 0, got);
  }
  return all;
}

std::string gunzipped(const std::string& bytes, std::size_t piece, std::string* trouble = nullptr) {
  cli::MemoryBytes memory(bytes, piece);
  cli::GunzipBytes source(memory, 64);
  const std::string all = drain(source);
  if (trouble) {
    *trouble = source.trouble();
  } else {
    EXPECT_EQ(source.trouble(), "");
  }
  return all;
}

const std::string kText = "The quick brown fox jumps over the lazy dog, again and again and again.\n";

TEST(Bytes, plain_bytes_pass_unchanged) {
  for (const std::size_t piece : {1, 2, 3, 1000}) {
    EXPECT_EQ(gunzipped(kText, piece), kText);
    EXPECT_EQ(gunzipped("", piece), "");
    EXPECT_EQ(gunzipped("\x1f", piece), "\x1f");  // half of the magic number is not gzip
  }
}

TEST(Bytes, gzip_is_known_by_its_content) {
  for (const std::size_t piece : {1, 2, 3, 1000}) EXPECT_EQ(gunzipped(gzip(kText), piece), kText);
}

TEST(Bytes, the_members_of_a_gzip_file_follow_one_another) {
  for (const std::size_t piece : {1, 5, 1000}) {
    EXPECT_EQ(gunzipped(gzip(kText) + gzip("") + gzip("end"), piece), kText + "end");
    EXPECT_EQ(gunzipped(gzip(kText) + "trailing bytes", piece), kText);
  }
}

TEST(Bytes, every_cut_of_a_gzip_file_is_noticed) {
  const std::string packed = gzip(kText);
  for (std::size_t length = 2; length < packed.size(); ++length) {
    std::string trouble;
    const std::string all = gunzipped(packed.substr(0, length), 1000, &trouble);
    EXPECT_EQ(trouble, "the gzip data end early") << length;
    EXPECT_EQ(all, kText.substr(0, all.size()));
  }
}

TEST(Bytes, a_wrong_checksum_is_noticed) {
  std::string packed = gzip(kText);
  packed[packed.size() - 8] = static_cast<char>(packed[packed.size() - 8] ^ 1);
  std::string trouble;
  gunzipped(packed, 1000, &trouble);
  EXPECT_EQ(trouble, "the gzip data are damaged (incorrect data check)");
}

TEST(Bytes, a_file_reports_its_progress) {
  const std::string path = ::testing::TempDir() + "qxsm_bytes_progress.txt";
  std::ofstream(path) << kText;
  std::uint64_t last = 0;
  std::uint64_t size = 0;
  cli::FileBytes file(path, [&](std::uint64_t done, std::uint64_t total) {
    last = done;
    size = total;
  });
  EXPECT_EQ(drain(file), kText);
  EXPECT_EQ(last, kText.size());
  EXPECT_EQ(size, kText.size());
}

TEST(Bytes, a_missing_file_is_an_error_and_a_folder_is_trouble) {
  EXPECT_THROW(cli::FileBytes(::testing::TempDir() + "no/such/file"), cli::CommandError);
  cli::FileBytes folder(::testing::TempDir());
  EXPECT_EQ(drain(folder), "");
  EXPECT_EQ(folder.trouble(), "cannot be read (Is a directory)");
}

}  // namespace
}  // namespace sm::test
