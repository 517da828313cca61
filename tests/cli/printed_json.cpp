#include "cli/printed_json.hpp"

#include <algorithm>
#include <nlohmann/json.hpp>
#include <ostream>
#include <stdexcept>

namespace sm::test {

struct PrintedJson::Reader {
  static PrintedJson read(const nlohmann::ordered_json& value) {
    PrintedJson json;
    if (value.is_boolean()) {
      json.kind_ = Kind::truth;
      json.number_ = value.get<bool>() ? 1.0L : 0.0L;
    } else if (value.is_number()) {
      json.kind_ = Kind::number;
      json.number_ = value.is_number_float()      ? static_cast<long double>(value.get<double>())
                     : value.is_number_unsigned() ? static_cast<long double>(value.get<std::uint64_t>())
                                                  : static_cast<long double>(value.get<std::int64_t>());
    } else if (value.is_string()) {
      json.kind_ = Kind::text;
      json.text_ = value.get<std::string>();
    } else if (!value.is_null()) {
      json.kind_ = value.is_object() ? Kind::object : Kind::list;
      for (const auto& [name, item] : value.items()) {
        if (value.is_object()) json.names_.push_back(name);
        json.items_.push_back(read(item));
      }
    }
    return json;
  }
};

PrintedJson PrintedJson::parse(const std::string& text) {
  try {
    return Reader::read(nlohmann::ordered_json::parse(text));
  } catch (const nlohmann::json::exception& error) {
    throw std::runtime_error(std::string(error.what()) + " in\n" + text);
  }
}

const PrintedJson& PrintedJson::at(const std::string& name) const {
  require(Kind::object, "an object");
  const auto place = std::find(names_.begin(), names_.end(), name);
  if (place == names_.end()) throw std::runtime_error("no member " + name);
  return items_[static_cast<std::size_t>(place - names_.begin())];
}

const PrintedJson& PrintedJson::operator[](std::size_t index) const { return items().at(index); }

bool PrintedJson::contains(const std::string& name) const {
  return std::find(names_.begin(), names_.end(), name) != names_.end();
}

std::size_t PrintedJson::size() const {
  if (kind_ != Kind::object) require(Kind::list, "a list");
  return items_.size();
}

bool PrintedJson::truth() const {
  require(Kind::truth, "a truth value");
  return number_ != 0.0L;
}

long double PrintedJson::number() const {
  require(Kind::number, "a number");
  return number_;
}

const std::string& PrintedJson::text() const {
  require(Kind::text, "a text");
  return text_;
}

const std::vector<PrintedJson>& PrintedJson::items() const {
  require(Kind::list, "a list");
  return items_;
}

void PrintedJson::require(Kind kind, const char* name) const {
  if (kind_ != kind) throw std::runtime_error(std::string("the JSON value is not ") + name);
}

std::ostream& operator<<(std::ostream& out, const PrintedJson& json) {
  using Kind = PrintedJson::Kind;
  if (json.kind_ == Kind::null) return out << "null";
  if (json.kind_ == Kind::truth) return out << (json.truth() ? "true" : "false");
  if (json.kind_ == Kind::number) return out << json.number_;
  if (json.kind_ == Kind::text) return out << '"' << json.text_ << '"';
  return out << (json.kind_ == Kind::list ? "a list of " : "an object of ") << json.items_.size();
}

}  // namespace sm::test
