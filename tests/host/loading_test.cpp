// Extension loading: where files are looked for, what they must define, and how a failure is told.
#include <dlfcn.h>
#include <gtest/gtest.h>
#include <qxesm/instance.h>
#include <qxhost/qxhost.h>
#include <unistd.h>

#include <cstdio>
#include <cstdlib>
#include <cwchar>
#include <string>
#include <vector>

#include "extensions/probe.h"

namespace {

const std::string kFirst = EXTENSIONS "/first";
const std::string kSecond = EXTENSIONS "/second";

// A folder of the test's own, with files in it, that goes when the test ends.
class Folder {
 public:
  Folder() {
    if (!mkdtemp(path_)) path_[0] = '\0';
  }
  ~Folder() {
    for (const std::string& file : files_) unlink(file.c_str());
    rmdir(path_);
  }
  Folder(const Folder&) = delete;
  Folder& operator=(const Folder&) = delete;

  std::string path() const { return path_; }
  void write(const std::string& name, const std::string& text) {
    files_.push_back(path() + "/" + name);
    std::FILE* file = std::fopen(files_.back().c_str(), "w");
    ASSERT_NE(file, nullptr);
    std::fputs(text.c_str(), file);
    std::fclose(file);
  }

 private:
  char path_[64] = "/tmp/qxhost_test_XXXXXX";
  std::vector<std::string> files_;
};

class LoadingTest : public ::testing::TestWithParam<int> {
 protected:
  void SetUp() override {
    const QxHostOptions options = {0, GetParam()};
    host = qxhost_create(&options);
    ASSERT_NE(host, nullptr);
  }
  void TearDown() override { qxhost_destroy(host); }

  void search(const std::string& folder) { ASSERT_EQ(qxhost_add_search_path(host, folder.c_str()), 0); }
  Probe* load(const wchar_t* name) {
    HostServices* services = qxhost_services(host);
    return static_cast<Probe*>(
        services->load_extension(services, name, static_cast<std::int64_t>(std::wcslen(name)), nullptr));
  }
  std::string error() { return qxhost_last_error(host); }

  QxHost* host = nullptr;
};

TEST_P(LoadingTest, an_extension_gets_the_services_and_then_its_entry_is_called_with_nulls) {
  search(kFirst);
  Probe* probe = load(L"probe");
  ASSERT_NE(probe, nullptr) << error();
  EXPECT_EQ(probe->mark, 1);
  EXPECT_EQ(probe->services, qxhost_services(host));
  EXPECT_EQ(probe->unused, nullptr);
  EXPECT_EQ(probe->owner, nullptr);
  EXPECT_EQ(probe->calls, 1);
  EXPECT_EQ(error(), "");
}

TEST_P(LoadingTest, each_load_calls_the_entry_and_the_library_stays_until_the_host_goes) {
  search(kFirst);
  const std::string file = kFirst + "/libprobe.so";
  ASSERT_EQ(dlopen(file.c_str(), RTLD_LAZY | RTLD_NOLOAD), nullptr);
  Probe* probe = load(L"probe");
  ASSERT_NE(probe, nullptr) << error();
  EXPECT_EQ(load(L"probe"), probe);
  EXPECT_EQ(probe->calls, 2);
  void* handle = dlopen(file.c_str(), RTLD_LAZY | RTLD_NOLOAD);
  ASSERT_NE(handle, nullptr);
  dlclose(handle);
  qxhost_destroy(host);
  host = nullptr;
  EXPECT_EQ(dlopen(file.c_str(), RTLD_LAZY | RTLD_NOLOAD), nullptr);
}

TEST_P(LoadingTest, folders_are_searched_in_the_order_they_were_added) {
  search(kSecond);
  search(kFirst);
  Probe* probe = load(L"probe");
  ASSERT_NE(probe, nullptr) << error();
  EXPECT_EQ(probe->mark, 2);
}

TEST_P(LoadingTest, a_later_folder_serves_what_earlier_ones_do_not_have) {
  search("/nonexistent/folder");
  search(kFirst);
  search(kSecond);
  Probe* probe = load(L"only_second");
  ASSERT_NE(probe, nullptr) << error();
  EXPECT_EQ(probe->mark, 3);
}

TEST_P(LoadingTest, the_folder_of_the_host_library_comes_first) {
  Folder folder;
  folder.write("libqxeavl.so", "not a library");
  search(folder.path());
  auto* trees = reinterpret_cast<TreeExtension*>(load(L"qxeavl"));
  ASSERT_NE(trees, nullptr) << error();
  trees->destroy(trees);
}

TEST_P(LoadingTest, the_first_file_of_the_name_decides_even_when_it_is_no_library) {
  Folder folder;
  folder.write("libprobe.so", "not a library");
  search(folder.path());
  search(kFirst);
  EXPECT_EQ(load(L"probe"), nullptr);
  EXPECT_EQ(error().rfind(folder.path() + "/libprobe.so: cannot be loaded: ", 0), 0U) << error();
  EXPECT_GT(error().size(), folder.path().size() + 40) << "names the cause";
}

TEST_P(LoadingTest, a_missing_library_is_named) {
  EXPECT_EQ(load(L"absent"), nullptr);
  EXPECT_EQ(error(), "libabsent.so: not found beside the host library");
  search(kFirst);
  EXPECT_EQ(load(L"absent"), nullptr);
  EXPECT_EQ(error(), "libabsent.so: not found beside the host library, nor in the folders added to the search");
}

TEST_P(LoadingTest, a_library_without_the_version_call_or_the_entry_is_refused) {
  search(kFirst);
  EXPECT_EQ(load(L"no_version"), nullptr);
  EXPECT_EQ(error(), kFirst + "/libno_version.so: has no qxextver");
  EXPECT_EQ(load(L"no_entry"), nullptr);
  EXPECT_EQ(error(), kFirst + "/libno_entry.so: has no entry no_entry");
}

TEST_P(LoadingTest, a_namesake_of_the_entry_in_another_library_is_not_called) {
  search(kFirst);
  EXPECT_EQ(load(L"malloc"), nullptr);
  EXPECT_EQ(error(), kFirst + "/libmalloc.so: has no entry malloc");
}

TEST_P(LoadingTest, an_extension_that_refuses_or_speaks_another_interface_is_refused) {
  search(kFirst);
  EXPECT_EQ(load(L"refuses"), nullptr);
  EXPECT_EQ(error(), kFirst + "/librefuses.so: its qxextver answered 7");
  EXPECT_EQ(load(L"newer"), nullptr);
  EXPECT_EQ(error(), kFirst + "/libnewer.so: speaks interface 6.1, this host speaks 5");
}

TEST_P(LoadingTest, an_entry_that_answers_null_is_told_with_the_cause_within) {
  search(kFirst);
  EXPECT_EQ(load(L"answers_null"), nullptr);
  EXPECT_EQ(error(), kFirst + "/libanswers_null.so: its entry answers_null answered null");
  EXPECT_EQ(load(L"needs_another"), nullptr);
  EXPECT_EQ(error(), kFirst +
                         "/libneeds_another.so: its entry needs_another answered null (libabsent.so: not found beside "
                         "the host library, nor in the folders added to the search)");
}

TEST_P(LoadingTest, the_error_stays_after_a_load_that_succeeds) {
  search(kFirst);
  load(L"absent");
  const std::string before = error();
  EXPECT_NE(load(L"probe"), nullptr);
  EXPECT_EQ(error(), before);
}

TEST_P(LoadingTest, names_are_plain_ascii_and_short) {
  search(kFirst);
  const std::wstring longest(64, L'a');
  for (const std::wstring& name : {std::wstring(L""), std::wstring(L"../probe"), std::wstring(L"pro be"),
                                   std::wstring(L"probe."), std::wstring(L"pr\u00f6be"), std::wstring(1, L'\0'),
                                   std::wstring(1, static_cast<wchar_t>(0x170)), longest + L"a"}) {
    EXPECT_EQ(load(name.c_str()), nullptr);
    EXPECT_EQ(error(), "extension name: 1 to 64 letters, digits and underscores expected");
  }
  EXPECT_EQ(load(longest.c_str()), nullptr);
  EXPECT_NE(error().find("not found"), std::string::npos);
}

TEST_P(LoadingTest, the_length_counts_not_the_end_of_the_string) {
  search(kFirst);
  EXPECT_NE(qxhost_load_extension(host, L"probe and more", 5), nullptr) << error();
  EXPECT_EQ(qxhost_load_extension(host, L"probe", 6), nullptr);
  EXPECT_EQ(qxhost_load_extension(host, L"probe", 0), nullptr);
  EXPECT_EQ(qxhost_load_extension(host, L"probe", -5), nullptr);
  EXPECT_EQ(qxhost_load_extension(host, nullptr, 5), nullptr);
}

TEST_P(LoadingTest, a_folder_that_is_null_or_empty_is_refused) {
  EXPECT_EQ(qxhost_add_search_path(host, nullptr), -1);
  EXPECT_EQ(qxhost_add_search_path(host, ""), -1);
}

TEST_P(LoadingTest, a_path_too_long_for_the_system_is_passed_over) {
  search("/" + std::string(5000, 'x'));
  search(kFirst);
  EXPECT_NE(load(L"probe"), nullptr) << error();
}

TEST_P(LoadingTest, the_module_loads_from_beside_the_host_and_leaves_nothing_behind) {
  auto* extension = static_cast<SmExtension*>(qxhost_load_extension(host, L"qxesm", 5));
  ASSERT_NE(extension, nullptr) << error();
  EXPECT_GE(qxhost_usage(host).pools_live, 1);
  extension->qxsmDestroyExtension(extension);
  EXPECT_EQ(qxhost_usage(host).pools_live, 0);
  EXPECT_EQ(qxhost_usage(host).bytes_in_use, 0U);
}

INSTANTIATE_TEST_SUITE_P(Modes, LoadingTest, ::testing::Values(0, 1),
                         [](const auto& mode) { return mode.param ? "checking" : "normal"; });

}  // namespace
