// A JSON value on its way to being printed. A small type of the command's own: the library that prints it takes seconds
// of every file that includes it, and is met in json.cpp only.
#pragma once

#include <concepts>
#include <cstdint>
#include <initializer_list>
#include <string>
#include <utility>
#include <variant>
#include <vector>

namespace sm::cli {

class Json {
 public:
  using Member = std::pair<std::string, Json>;
  using List = std::vector<Json>;
  using Object = std::vector<Member>;  // in the order in which the members came
  using Value = std::variant<std::nullptr_t, bool, std::int64_t, std::uint64_t, double, std::string, List, Object>;

  Json();  // null
  Json(const Json& other);
  Json(Json&& other) noexcept;
  Json& operator=(const Json& other);
  Json& operator=(Json&& other) noexcept;
  ~Json();

  Json(bool value);
  Json(double value);
  Json(const char* text);
  Json(std::string text);
  Json(std::signed_integral auto value) : Json(Value(static_cast<std::int64_t>(value))) {}
  Json(std::unsigned_integral auto value) : Json(Value(static_cast<std::uint64_t>(value))) {}
  template <class T>
  Json(const std::vector<T>& list) : Json(array()) {
    for (const T& item : list) push_back(item);
  }
  // An object when every item is a pair that begins with a text, else a list: {{"row", 1}, {"value", 0.5}}.
  Json(std::initializer_list<Json> items);

  static Json array();
  static Json object();

  // Of a list; of null, which it makes a list.
  void push_back(Json item);
  // Of an object, in which a member that is missing is made; of null, which it makes an object.
  Json& operator[](const std::string& name);

  const Value& value() const { return value_; }

 private:
  explicit Json(Value value);

  Value value_;
};

// Indented, with a line feed at the end. Numbers that JSON does not have are null.
std::string json_text(const Json& json);

}  // namespace sm::cli
