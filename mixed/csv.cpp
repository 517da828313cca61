#include "mixed/csv.hpp"

#include <csv.h>
#include <fcntl.h>
#include <fmt/core.h>
#include <unistd.h>
#include <zlib.h>

#include <cerrno>
#include <cstring>
#include <limits>
#include <memory>
#include <new>
#include <system_error>
#include <vector>

#include "mixed/error.hpp"
#include "mixed/text.hpp"
#include "mixed/words.hpp"

namespace sm::mixed {
namespace {

constexpr std::string_view kByteOrderMark = "\xef\xbb\xbf";
constexpr unsigned kBufferBytes = 1u << 18;

[[noreturn]] void cannot_read(const std::string& path, const std::string& why) {
  throw ModelError({.file = path,
                    .what = fmt::format("cannot be read ({})", why),
                    .expected = "a table as CSV or TSV, plain or gzip",
                    .advice = "check the path and its permissions"});
}

struct CloseGzip {
  void operator()(gzFile file) const { gzclose_r(file); }
};

// The end of the line that begins at `from`, behind its line feed, carriage return or both.
std::size_t line_end(std::string_view text, std::size_t from) {
  const std::size_t feed = std::min(text.find('\n', from), text.size());
  const std::size_t turn = text.substr(0, feed).find('\r', from);
  if (turn != std::string_view::npos && turn + 1 != feed) return turn + 1;
  return std::min(feed + 1, text.size());
}

// Walks over a row as written. After each call `place` is where the next field begins; false at the end of the row.
class FieldWalk {
 public:
  FieldWalk(const CsvRow& row, char delimiter) : row_(row), delimiter_(delimiter), place_{row.line, 1} {}
  CsvPlace place() const { return place_; }
  CsvPlace last_quote() const { return last_quote_; }  // the last one that opened a field

  bool next_field() {
    bool quoted = false;
    bool closed = false;
    for (; at_ < row_.source.size(); ++at_) {
      const char c = row_.source[at_];
      if (c == '"') {
        if (!quoted && !closed) last_quote_ = place_;  // one that follows a closing quote is doubled
        closed = quoted;
        quoted = !quoted;
      } else {
        closed = false;
      }
      const bool line_feed = c == '\n' || c == '\r';
      if (!quoted && line_feed) return false;
      if (c == '\n' || (c == '\r' && row_.source.substr(at_ + 1, 1) != "\n")) {
        ++place_.line;
        place_.column = 1;
      } else if ((static_cast<unsigned char>(c) & 0xc0u) != 0x80u) {
        ++place_.column;
      }
      if (!quoted && c == delimiter_) {
        ++at_;
        return true;
      }
    }
    return false;
  }

 private:
  const CsvRow& row_;
  char delimiter_;
  std::size_t at_ = 0;
  CsvPlace place_;
  CsvPlace last_quote_;
};

// libcsv knows neither lines nor places, so it is given one line at a time.
class Scanner {
 public:
  Scanner(std::string_view text, const std::string& name, char delimiter)
      : text_(text), name_(name), delimiter_(delimiter) {
    if (csv_init(&parser_, CSV_STRICT | CSV_STRICT_FINI) != 0) throw std::bad_alloc();
    csv_set_delim(&parser_, static_cast<unsigned char>(delimiter));
    if (text_.starts_with(kByteOrderMark)) at_ = row_begin_ = kByteOrderMark.size();
  }
  ~Scanner() { csv_free(&parser_); }
  Scanner(const Scanner&) = delete;
  Scanner& operator=(const Scanner&) = delete;

  void run(const std::function<bool(const CsvRow&)>& take) {
    while (at_ < text_.size()) {
      const std::size_t end = line_end(text_, at_);
      const std::size_t done = csv_parse(&parser_, text_.data() + at_, end - at_, &on_field, &on_row, this);
      if (done != end - at_) misplaced_quote(at_ + done, end);
      at_ = end;
      ++line_;
      if (row_done_ && !hand_over(take)) return;
      if (ends_.empty() && !csv_in_quotes()) begin_row();  // a blank line
    }
    if (csv_fini(&parser_, &on_field, &on_row, this) != 0) open_quote();
    if (row_done_) hand_over(take);
  }

 private:
  static void on_field(void* bytes, std::size_t count, void* self) {
    auto& scanner = *static_cast<Scanner*>(self);
    scanner.row_.append(static_cast<const char*>(bytes), count);
    scanner.ends_.push_back(scanner.row_.size());
  }
  static void on_row(int, void* self) { static_cast<Scanner*>(self)->row_done_ = true; }

  // Between rows the parser is in its first state, whatever that is called.
  bool csv_in_quotes() const { return parser_.pstate != 0; }

  void begin_row() {
    row_begin_ = at_;
    row_line_ = line_;
    row_.clear();
    ends_.clear();
    row_done_ = false;
  }

  CsvRow row() {
    fields_.clear();
    std::size_t from = 0;
    for (const std::size_t end : ends_) {
      fields_.push_back(std::string_view(row_).substr(from, end - from));
      from = end;
    }
    return {.line = row_line_, .source = text_.substr(row_begin_, at_ - row_begin_), .fields = fields_};
  }

  bool hand_over(const std::function<bool(const CsvRow&)>& take) {
    const bool more = take(row());
    begin_row();
    return more;
  }

  [[noreturn]] void misplaced_quote(std::size_t at, std::size_t end) {
    if (csv_error(&parser_) != CSV_EPARSE) throw std::bad_alloc();
    const std::size_t line_begin = line_ == row_line_ ? row_begin_ : at_;
    const std::string_view rest = text_.substr(at, end - at);
    const bool quote_found = rest.starts_with('"');
    throw ModelError({.file = name_,
                      .line = line_,
                      .column = 1 + characters(text_.substr(line_begin, at - line_begin)),
                      .what = quote_found ? "found a quote inside a field that does not begin with one"
                                          : fmt::format("found {} behind the closing quote of a field",
                                                        quote(rest.substr(0, rest.find_first_of("\r\n")))),
                      .expected = quote_found ? "" : "the delimiter or the end of the line",
                      .advice = "put the whole field in quotes and double the quotes inside it"});
  }

  [[noreturn]] void open_quote() {
    if (csv_error(&parser_) == CSV_ENOMEM) throw std::bad_alloc();
    const CsvRow row{.line = row_line_, .source = text_.substr(row_begin_), .fields = {}};
    FieldWalk walk(row, delimiter_);
    while (walk.next_field()) {
    }
    throw ModelError({.file = name_,
                      .line = walk.last_quote().line,
                      .column = walk.last_quote().column,
                      .what = "found a quote that is never closed",
                      .expected = "a closing quote before the end of the file",
                      .advice = "close it, or take it away"});
  }

  std::string_view text_;
  const std::string& name_;
  char delimiter_;
  csv_parser parser_{};
  std::size_t at_ = 0;
  std::int64_t line_ = 1;
  std::size_t row_begin_ = 0;
  std::int64_t row_line_ = 1;
  std::string row_;                // the fields of the row, one behind the other
  std::vector<std::size_t> ends_;  // where each of them ends
  std::vector<std::string_view> fields_;
  bool row_done_ = false;
};

// The first byte that no text in UTF-8 has: one of value 0, or one that is no part of a character; npos when there is
// none.
std::size_t find_no_text(std::string_view text) {
  std::size_t at = std::min(text.find('\0'), text.size());
  std::string_view rest = text.substr(0, at);
  while (!rest.empty()) {
    const std::size_t before = rest.size();
    const bool ascii = (static_cast<unsigned char>(rest.front()) & 0x80u) == 0;
    next_character(rest);
    if (!ascii && before - rest.size() == 1) return at - before;
    if (!ascii) continue;
    // Most tables are hardly anything else: eight characters at a time.
    std::uint64_t eight = 0;
    while (rest.size() >= sizeof eight) {
      std::memcpy(&eight, rest.data(), sizeof eight);
      if ((eight & 0x8080808080808080u) != 0) break;
      rest.remove_prefix(sizeof eight);
    }
  }
  return at < text.size() ? at : std::string_view::npos;
}

void refuse_no_text(std::string_view text, const std::string& name) {
  const std::size_t at = find_no_text(text);
  if (at == std::string_view::npos) return;
  std::int64_t line = 1;
  std::size_t begin = 0;
  for (std::size_t end = line_end(text, begin); end <= at; end = line_end(text, begin)) {
    begin = end;
    ++line;
  }
  const auto byte = static_cast<unsigned char>(text[at]);
  const bool utf16 = byte == 0 || text.starts_with("\xff\xfe") || text.starts_with("\xfe\xff");
  throw ModelError({.file = name,
                    .line = line,
                    .column = 1 + characters(text.substr(begin, at - begin)),
                    .what = byte == 0 ? "found a byte of value 0"
                                      : fmt::format("found the byte 0x{:02x}, which is no character of UTF-8", byte),
                    .expected = "text in UTF-8",
                    .advice = utf16 ? "save the table as CSV in UTF-8 (not UTF-16, not a spreadsheet file)"
                                    : "save the table as CSV in UTF-8, or convert it: "
                                      "iconv -f WINDOWS-1252 -t UTF-8 OLD.csv > NEW.csv"});
}

}  // namespace

std::string read_text(const std::string& path) {
  const int descriptor = path == "-" ? ::dup(STDIN_FILENO) : ::open(path.c_str(), O_RDONLY | O_CLOEXEC);
  if (descriptor < 0) cannot_read(path, std::generic_category().message(errno));
  const std::unique_ptr<gzFile_s, CloseGzip> file(gzdopen(descriptor, "rb"));
  if (!file) {
    ::close(descriptor);
    throw std::bad_alloc();
  }
  gzbuffer(file.get(), kBufferBytes);
  std::string text;
  for (;;) {
    const std::size_t kept = text.size();
    text.resize(std::max<std::size_t>(kBufferBytes, 2 * kept));
    const std::size_t room = std::min<std::size_t>(text.size() - kept, std::numeric_limits<int>::max());
    const int got = gzread(file.get(), text.data() + kept, static_cast<unsigned>(room));
    int code = Z_OK;
    const char* const why = gzerror(file.get(), &code);
    if (got < 0 || code == Z_BUF_ERROR) {
      cannot_read(path, code == Z_ERRNO       ? std::generic_category().message(errno)
                        : code == Z_BUF_ERROR ? "the gzip data end early"
                                              : fmt::format("the gzip data are damaged: {}", why));
    }
    text.resize(kept + static_cast<std::size_t>(got));
    if (got == 0) break;
  }
  refuse_no_text(text, path);
  return text;
}

char sniff_delimiter(std::string_view text) {
  if (text.starts_with(kByteOrderMark)) text.remove_prefix(kByteOrderMark.size());
  std::size_t begin = 0;
  while (begin < text.size() && (text[begin] == '\n' || text[begin] == '\r' || text[begin] == ' ')) ++begin;
  std::size_t commas = 0;
  std::size_t tabs = 0;
  std::size_t semicolons = 0;
  bool quoted = false;
  for (const char c : text.substr(begin)) {
    if (c == '"') quoted = !quoted;
    if (quoted) continue;
    if (c == '\n' || c == '\r') break;
    commas += c == ',';
    tabs += c == '\t';
    semicolons += c == ';';
  }
  if (tabs > commas && tabs >= semicolons) return '\t';
  return semicolons > commas ? ';' : ',';
}

void scan_csv(std::string_view text, const std::string& name, char delimiter,
              const std::function<bool(const CsvRow& row)>& take) {
  Scanner(text, name, delimiter).run(take);
}

CsvPlace place_of_field(const CsvRow& row, char delimiter, std::size_t index) {
  FieldWalk walk(row, delimiter);
  for (std::size_t field = 0; field < index; ++field) {
    if (!walk.next_field()) break;
  }
  return walk.place();
}

}  // namespace sm::mixed
