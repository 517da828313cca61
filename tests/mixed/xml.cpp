#include "mixed/xml.hpp"

#include <cctype>

#include "mixed/text.hpp"

namespace sm::mixed::test {
namespace {

class Parser {
 public:
  explicit Parser(std::string_view text) : rest_(text) {}

  Document parsed() {
    check_characters(rest_);
    if (rest_.starts_with("<?xml ")) rest_.remove_prefix(rest_.find("?>") + 2);
    while (document_.fault.empty() && !rest_.empty()) {
      if (rest_.front() == '<') {
        tag();
      } else {
        content();
      }
    }
    if (document_.fault.empty() && !open_.empty()) fail("unclosed " + document_.elements[open_.back()].name);
    if (document_.fault.empty() && document_.elements.empty()) fail("no element");
    return document_;
  }

 private:
  void fail(const std::string& what) {
    if (document_.fault.empty()) document_.fault = what;
  }

  // XML 1.0 has no control characters but tab and line breaks, and must be UTF-8 here.
  void check_characters(std::string_view text) {
    while (!text.empty()) {
      const std::string_view before = text;
      const char32_t c = next_character(text);
      if (c == 0xFFFD && before.size() - text.size() == 1) return fail("a byte that is not UTF-8");
      if (c < 0x20 && c != '\t' && c != '\n' && c != '\r') return fail("a control character");
    }
  }

  std::string resolved(std::string_view text) {
    static const std::map<std::string_view, char> kEntities = {
        {"amp", '&'}, {"lt", '<'}, {"gt", '>'}, {"quot", '"'}, {"apos", '\''}};
    std::string out;
    while (!text.empty()) {
      if (text.front() != '&') {
        if (text.front() == '<') fail("a bare <");
        out += text.front();
        text.remove_prefix(1);
        continue;
      }
      const std::size_t end = text.find(';');
      const auto entity = kEntities.find(text.substr(1, end == std::string_view::npos ? 0 : end - 1));
      if (entity == kEntities.end()) {
        fail("a bare &");
        return out;
      }
      out += entity->second;
      text.remove_prefix(end + 1);
    }
    return out;
  }

  void content() {
    const std::size_t end = std::min(rest_.find('<'), rest_.size());
    const std::string text = resolved(rest_.substr(0, end));
    if (!open_.empty()) {
      document_.elements[open_.back()].text += text;
    } else if (text.find_first_not_of(" \n") != std::string::npos) {
      fail("text outside of the root");
    }
    rest_.remove_prefix(end);
  }

  static bool is_name(char c) { return std::isalnum(static_cast<unsigned char>(c)) != 0 || c == '-' || c == ':'; }

  std::string name() {
    std::size_t end = 0;
    while (end < rest_.size() && is_name(rest_[end])) ++end;
    std::string out(rest_.substr(0, end));
    if (out.empty()) fail("a tag without a name");
    rest_.remove_prefix(end);
    return out;
  }

  void spaces() {
    while (!rest_.empty() && (rest_.front() == ' ' || rest_.front() == '\n')) rest_.remove_prefix(1);
  }

  void tag() {
    rest_.remove_prefix(1);
    if (rest_.starts_with("/")) {
      rest_.remove_prefix(1);
      if (open_.empty() || name() != document_.elements[open_.back()].name) return fail("an end tag without its start");
      open_.pop_back();
      if (!rest_.starts_with(">")) return fail("an end tag that does not end");
      rest_.remove_prefix(1);
      return;
    }
    if (open_.empty() && !document_.elements.empty()) return fail("a second root");
    Element element{name(), {}, {}};
    for (spaces(); document_.fault.empty() && !rest_.empty() && is_name(rest_.front()); spaces()) attribute(element);
    const bool closed = rest_.starts_with("/");
    if (closed) rest_.remove_prefix(1);
    if (!rest_.starts_with(">")) return fail("a tag that does not end");
    rest_.remove_prefix(1);
    if (!closed) open_.push_back(document_.elements.size());
    document_.elements.push_back(element);
  }

  void attribute(Element& element) {
    const std::string key = name();
    const std::size_t end = rest_.starts_with("=\"") ? rest_.find('"', 2) : std::string_view::npos;
    if (end == std::string_view::npos) return fail("an attribute without a quoted value");
    if (!element.attributes.emplace(key, resolved(rest_.substr(2, end - 2))).second)
      fail("a repeated attribute " + key);
    rest_.remove_prefix(end + 1);
  }

  std::string_view rest_;
  std::vector<std::size_t> open_;
  Document document_;
};

}  // namespace

Document parsed_xml(std::string_view text) { return Parser(text).parsed(); }

std::vector<Element> named(const Document& document, const std::string& name) {
  std::vector<Element> out;
  for (const Element& element : document.elements) {
    if (element.name == name) out.push_back(element);
  }
  return out;
}

}  // namespace sm::mixed::test
