// Where the bytes of an input come from: a file or a pipe, a block of memory, and either of them through gzip.
#pragma once

#include <zlib.h>

#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <span>
#include <string>

namespace sm::cli {

class ByteSource {
 public:
  virtual ~ByteSource() = default;
  // Up to `size` bytes into `out`; 0 when there are no more.
  virtual std::size_t read(char* out, std::size_t size) = 0;
  // Why the bytes ended where they did, when that was not their natural end; else empty.
  virtual std::string trouble() const { return {}; }
};

// Bytes read so far and bytes in all; the latter is 0 for a pipe.
using ReadProgress = std::function<void(std::uint64_t done, std::uint64_t total)>;

// A file, or standard input for the path "-". Throws CommandError when it cannot be opened.
class FileBytes : public ByteSource {
 public:
  explicit FileBytes(const std::string& path, ReadProgress progress = {});
  ~FileBytes() override;
  FileBytes(const FileBytes&) = delete;
  FileBytes& operator=(const FileBytes&) = delete;
  std::size_t read(char* out, std::size_t size) override;
  std::string trouble() const override { return trouble_; }

 private:
  int file_ = -1;
  std::uint64_t done_ = 0;
  std::uint64_t total_ = 0;
  ReadProgress progress_;
  std::string trouble_;
};

// A block of memory, handed out in pieces of at most `piece` bytes.
class MemoryBytes : public ByteSource {
 public:
  explicit MemoryBytes(std::span<const char> bytes, std::size_t piece = SIZE_MAX) : rest_(bytes), piece_(piece) {}
  std::size_t read(char* out, std::size_t size) override;

 private:
  std::span<const char> rest_;
  std::size_t piece_;
};

// The bytes of another source; when they begin like gzip data (by content, not by name), what they decompress to.
class GunzipBytes : public ByteSource {
 public:
  GunzipBytes(ByteSource& inner, std::size_t buffer);
  ~GunzipBytes() override;
  GunzipBytes(const GunzipBytes&) = delete;
  GunzipBytes& operator=(const GunzipBytes&) = delete;
  std::size_t read(char* out, std::size_t size) override;
  std::string trouble() const override { return trouble_.empty() ? inner_.trouble() : trouble_; }

 private:
  std::size_t read_plain(char* out, std::size_t size);
  bool refill();        // false when the inner source has no more bytes
  bool start_member();  // at the end of a gzip member: is there another one?
  bool has_magic();

  ByteSource& inner_;
  std::unique_ptr<char[]> input_;
  std::size_t input_size_;
  std::size_t input_begin_ = 0;
  std::size_t input_end_ = 0;
  std::unique_ptr<z_stream> stream_;  // null for plain bytes
  bool finished_ = false;
  std::string trouble_;
};

}  // namespace sm::cli
