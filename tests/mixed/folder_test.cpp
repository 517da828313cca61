#include "mixed/folder.hpp"

#include <gtest/gtest.h>
#include <sys/resource.h>

#include <csignal>

#include "mixed/error.hpp"
#include "mixed/scratch_folder.hpp"

namespace sm::mixed::test {
namespace {

using Strings = std::vector<std::string>;

std::string refusal(const std::string& folder, const std::vector<NamedText>& files) {
  try {
    write_files(folder, files);
  } catch (const ModelError& error) {
    return error.what();
  }
  return "";
}

TEST(Folder, holds_whole_files_and_nothing_else) {
  const ScratchFolder scratch;
  const std::string folder = scratch.path() + "/a/b";
  write_files(folder, {{"one", "1\n"}, {"two", std::string("2\0\n", 3)}, {"three", "3\n"}});
  EXPECT_EQ(names_in(folder), (Strings{"one", "three", "two"}));
  EXPECT_EQ(content(folder + "/two"), std::string("2\0\n", 3));
  write_files(folder, {{"one", ""}}, {"two", "never there"});
  EXPECT_EQ(names_in(folder), (Strings{"one", "three"}));
  EXPECT_EQ(content(folder + "/one"), "");
}

TEST(Folder, is_refused_with_path_reason_and_remedy) {
  const ScratchFolder scratch;
  write_files(scratch.path(), {{"file", "text"}});
  const std::string file = scratch.path() + "/file";
  EXPECT_EQ(refusal(file, {}), file + ": is a file, where a folder is needed; give another path");
  EXPECT_EQ(refusal(file + "/below", {}),
            file + "/below: cannot be created (Not a directory); check the path and the permissions of its folders");
  EXPECT_EQ(refusal("", {}), "the name of the folder for the results is empty; give a path");
}

TEST(Folder, keeps_all_its_files_when_one_cannot_be_replaced) {
  const ScratchFolder scratch;
  write_files(scratch.path(), {{"one", "old"}});
  std::filesystem::create_directory(scratch.path() + "/two");
  EXPECT_EQ(refusal(scratch.path(), {{"one", "new"}, {"two", "new"}}),
            scratch.path() +
                "/two: is a folder, where a file is to be written; rename it, or give another folder for "
                "the results");
  EXPECT_EQ(content(scratch.path() + "/one"), "old");
  EXPECT_EQ(names_in(scratch.path()), (Strings{"one", "two"}));
}

// A limit on the size of a file stands for a full disk.
class FileSizeLimit {
 public:
  explicit FileSizeLimit(rlim_t bytes) : handler_(std::signal(SIGXFSZ, SIG_IGN)) {
    ::getrlimit(RLIMIT_FSIZE, &before_);
    const rlimit limit{bytes, before_.rlim_max};
    ::setrlimit(RLIMIT_FSIZE, &limit);
  }
  ~FileSizeLimit() {
    ::setrlimit(RLIMIT_FSIZE, &before_);
    std::signal(SIGXFSZ, handler_);
  }
  FileSizeLimit(const FileSizeLimit&) = delete;
  FileSizeLimit& operator=(const FileSizeLimit&) = delete;

 private:
  rlimit before_{};
  void (*handler_)(int);
};

TEST(Folder, keeps_all_its_files_when_there_is_no_room_for_new_ones) {
  const ScratchFolder scratch;
  write_files(scratch.path(), {{"one", "old"}});
  std::string said;
  {
    const FileSizeLimit limit(1000);
    said = refusal(scratch.path(), {{"one", "new"}, {"two", std::string(5000, 'x')}});
  }
  EXPECT_EQ(said, scratch.path() +
                      "/two: cannot be written (File too large); check the folder's permissions and the "
                      "free space");
  EXPECT_EQ(names_in(scratch.path()), (Strings{"one"}));
  EXPECT_EQ(content(scratch.path() + "/one"), "old");
}

}  // namespace
}  // namespace sm::mixed::test
