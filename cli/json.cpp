#include "cli/json.hpp"

#include <algorithm>
#include <nlohmann/json.hpp>

namespace sm::cli {
namespace {

using Printable = nlohmann::ordered_json;

bool is_member(const Json& item) {
  const auto* const pair = std::get_if<Json::List>(&item.value());
  return pair && pair->size() == 2 && std::holds_alternative<std::string>(pair->front().value());
}

struct ToPrintable {
  template <class Scalar>
  Printable operator()(const Scalar& value) const {
    return value;
  }
  Printable operator()(const Json::List& list) const {
    Printable out = Printable::array();
    for (const Json& item : list) out.push_back(std::visit(*this, item.value()));
    return out;
  }
  Printable operator()(const Json::Object& object) const {
    Printable out = Printable::object();
    for (const auto& [name, item] : object) out[name] = std::visit(*this, item.value());
    return out;
  }
};

}  // namespace

Json::Json() : value_(nullptr) {}
Json::Json(const Json& other) = default;
Json::Json(Json&& other) noexcept = default;
Json& Json::operator=(const Json& other) = default;
Json& Json::operator=(Json&& other) noexcept = default;
Json::~Json() = default;

Json::Json(Value value) : value_(std::move(value)) {}
Json::Json(bool value) : value_(value) {}
Json::Json(double value) : value_(value) {}
Json::Json(const char* text) : value_(std::string(text)) {}
Json::Json(std::string text) : value_(std::move(text)) {}

Json::Json(std::initializer_list<Json> items) {
  if (items.size() == 0 || !std::all_of(items.begin(), items.end(), is_member)) {
    value_ = List(items);
    return;
  }
  Object object;
  for (const Json& item : items) {
    const List& pair = std::get<List>(item.value_);
    object.emplace_back(std::get<std::string>(pair[0].value_), pair[1]);
  }
  value_ = std::move(object);
}

Json Json::array() { return Json(Value(List())); }
Json Json::object() { return Json(Value(Object())); }

void Json::push_back(Json item) {
  if (std::holds_alternative<std::nullptr_t>(value_)) value_ = List();
  std::get<List>(value_).push_back(std::move(item));
}

Json& Json::operator[](const std::string& name) {
  if (std::holds_alternative<std::nullptr_t>(value_)) value_ = Object();
  Object& object = std::get<Object>(value_);
  const auto place = std::find_if(object.begin(), object.end(), [&](const Member& m) { return m.first == name; });
  return place != object.end() ? place->second : object.emplace_back(name, Json()).second;
}

std::string json_text(const Json& json) {
  // File names need not be UTF-8, but JSON must be.
  return std::visit(ToPrintable(), json.value()).dump(2, ' ', false, Printable::error_handler_t::replace) + "\n";
}

}  // namespace sm::cli
