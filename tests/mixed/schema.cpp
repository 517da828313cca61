#include "mixed/schema.hpp"

#include <functional>
#include <map>
#include <nlohmann/json.hpp>

namespace sm::mixed::test {
namespace {

using Json = nlohmann::json;

bool is_of_type(const Json& instance, const std::string& type) {
  if (type == "integer") return instance.is_number_integer();
  if (type == "number") return instance.is_number();
  if (type == "string") return instance.is_string();
  if (type == "boolean") return instance.is_boolean();
  if (type == "null") return instance.is_null();
  if (type == "array") return instance.is_array();
  return type == "object" && instance.is_object();
}

class Validator {
 public:
  explicit Validator(const Json& root) : root_(root) {}

  void check(const Json& schema, const Json& instance, const std::string& place) {
    for (const auto& [keyword, value] : schema.items()) check_keyword(schema, keyword, value, instance, place);
  }
  std::vector<std::string> found;

 private:
  void expect(bool holds, const std::string& place, const std::string& what) {
    if (!holds) found.push_back(place + ": " + what);
  }

  void check_keyword(const Json& schema, const std::string& keyword, const Json& value, const Json& instance,
                     const std::string& place) {
    if (keyword == "type") {
      const Json types = value.is_array() ? value : Json::array({value});
      expect(std::any_of(types.begin(), types.end(), [&](const Json& t) { return is_of_type(instance, t); }), place,
             "not of type " + value.dump());
    } else if (keyword == "const") {
      expect(instance == value, place, "not " + value.dump());
    } else if (keyword == "enum") {
      expect(std::find(value.begin(), value.end(), instance) != value.end(), place, "not one of " + value.dump());
    } else if (keyword == "minimum") {
      expect(!instance.is_number() || instance.get<double>() >= value.get<double>(), place, "below the minimum");
    } else if (keyword == "required") {
      for (const std::string key : value) expect(instance.contains(key), place, "lacks " + key);
    } else if (keyword == "anyOf") {
      expect(std::any_of(value.begin(), value.end(), [&](const Json& s) { return conforms(s, instance); }), place,
             "conforms to none of the alternatives");
    } else if (keyword == "$ref") {
      check(root_.at(Json::json_pointer(value.get<std::string>().substr(1))), instance, place);
    } else {
      check_parts(schema, keyword, value, instance, place);
    }
  }

  void check_parts(const Json& schema, const std::string& keyword, const Json& value, const Json& instance,
                   const std::string& place) {
    if (keyword == "items") {
      for (std::size_t i = 0; instance.is_array() && i < instance.size(); ++i) {
        check(value, instance[i], place + "/" + std::to_string(i));
      }
    } else if (keyword == "properties") {
      for (const auto& [key, part] : value.items()) {
        if (instance.contains(key)) check(part, instance[key], place + "/" + key);
      }
    } else if (keyword == "additionalProperties") {
      for (const auto& [key, part] : instance.items()) {
        expect(value != false || schema.at("properties").contains(key), place, "has an unknown " + key);
      }
    } else {
      const std::vector<std::string> silent = {"$schema", "$id", "$defs", "title", "description"};
      expect(std::find(silent.begin(), silent.end(), keyword) != silent.end(), place, "unknown keyword " + keyword);
    }
  }

  bool conforms(const Json& schema, const Json& instance) const {
    Validator validator(root_);
    validator.check(schema, instance, "");
    return validator.found.empty();
  }

  const Json& root_;
};

}  // namespace

std::vector<std::string> violations(const nlohmann::json& schema, const nlohmann::json& instance) {
  Validator validator(schema);
  validator.check(schema, instance, "");
  return validator.found;
}

}  // namespace sm::mixed::test
