#include "mixed/folder.hpp"

#include <fcntl.h>
#include <fmt/core.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <filesystem>
#include <string_view>
#include <system_error>
#include <utility>

#include "mixed/error.hpp"

namespace sm::mixed {
namespace {

constexpr int kMode = 0666;
constexpr const char* kAdvice = "check the folder's permissions and the free space";

std::string path_of(const std::string& folder, const std::string& name) { return fmt::format("{}/{}", folder, name); }

std::string system_text(int error_number) { return std::generic_category().message(error_number); }

[[noreturn]] void refuse(const std::string& path, const std::string& what, const std::string& advice) {
  Fault fault;
  fault.file = path;
  fault.what = what;
  fault.advice = advice;
  throw ModelError(fault);
}

[[noreturn]] void cannot_be_written(const std::string& path, int error_number) {
  refuse(path, "cannot be written (" + system_text(error_number) + ")", kAdvice);
}

// A file that is not there until it is published.
class HiddenFile {
 public:
  HiddenFile(const std::string& folder, const std::string& name) : path_(path_of(folder, name)) {
    constexpr int kTries = 100;
    for (int i = 0; i < kTries && file_ < 0; ++i) {
      temporary_ = fmt::format("{}/.{}.{}.{}", folder, name, ::getpid(), i);
      file_ = ::open(temporary_.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, kMode);
      if (file_ < 0 && errno != EEXIST) break;
    }
    if (file_ < 0) cannot_be_written(path_, errno);
  }
  ~HiddenFile() {
    if (file_ >= 0) ::close(file_);
    if (!published_) ::unlink(temporary_.c_str());
  }
  HiddenFile(HiddenFile&& other) noexcept
      : path_(std::move(other.path_)),
        temporary_(std::move(other.temporary_)),
        file_(std::exchange(other.file_, -1)),
        published_(std::exchange(other.published_, true)) {}
  HiddenFile(const HiddenFile&) = delete;
  HiddenFile& operator=(const HiddenFile&) = delete;
  HiddenFile& operator=(HiddenFile&&) = delete;

  void write(std::string_view text) {
    while (!text.empty()) {
      const ssize_t written = ::write(file_, text.data(), text.size());
      if (written > 0) {
        text.remove_prefix(static_cast<std::size_t>(written));
      } else if (errno != EINTR) {
        cannot_be_written(path_, errno);
      }
    }
    if (::close(std::exchange(file_, -1)) != 0) cannot_be_written(path_, errno);
  }

  void publish() {
    if (::rename(temporary_.c_str(), path_.c_str()) != 0) cannot_be_written(path_, errno);
    published_ = true;
  }

 private:
  std::string path_;
  std::string temporary_;
  int file_ = -1;
  bool published_ = false;
};

void refuse_folder_in_the_way(const std::string& path) {
  struct stat there {};
  if (::lstat(path.c_str(), &there) == 0 && S_ISDIR(there.st_mode)) {
    refuse(path, "is a folder, where a file is to be written", "rename it, or give another folder for the results");
  }
}

}  // namespace

void prepare_folder(const std::string& folder) {
  if (folder.empty()) refuse("", "the name of the folder for the results is empty", "give a path");
  std::error_code error;
  std::filesystem::create_directories(folder, error);
  struct stat there {};
  if (::stat(folder.c_str(), &there) == 0) {
    if (!S_ISDIR(there.st_mode)) refuse(folder, "is a file, where a folder is needed", "give another path");
    if (::access(folder.c_str(), W_OK | X_OK) != 0) {
      refuse(folder, "cannot be written into (" + system_text(errno) + ")", "give a folder that you may write to");
    }
    return;
  }
  const int reason = error ? error.value() : errno;
  refuse(folder, "cannot be created (" + system_text(reason) + ")",
         "check the path and the permissions of its folders");
}

void write_files(const std::string& folder, const std::vector<NamedText>& files,
                 const std::vector<std::string>& outdated) {
  prepare_folder(folder);
  std::vector<HiddenFile> hidden;
  hidden.reserve(files.size());
  for (const NamedText& file : files) {
    refuse_folder_in_the_way(path_of(folder, file.name));
    hidden.emplace_back(folder, file.name);
    hidden.back().write(file.text);
  }
  for (HiddenFile& file : hidden) file.publish();
  for (const std::string& name : outdated) {
    const std::string path = path_of(folder, name);
    if (::unlink(path.c_str()) != 0 && errno != ENOENT) {
      refuse(path, "is of an earlier fit and cannot be removed (" + system_text(errno) + ")", "remove it yourself");
    }
  }
}

}  // namespace sm::mixed
