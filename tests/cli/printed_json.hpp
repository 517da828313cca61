// What a program has printed as JSON, to be looked into. A small reader: the library behind it takes seconds of every
// file that includes it.
#pragma once

#include <concepts>
#include <iosfwd>
#include <string>
#include <vector>

namespace sm::test {

class PrintedJson {
 public:
  // Throws std::runtime_error for what is no JSON, as the others do for what is not there.
  static PrintedJson parse(const std::string& text);

  const PrintedJson& at(const std::string& name) const;    // a member
  const PrintedJson& operator[](std::size_t index) const;  // an item of a list
  bool contains(const std::string& name) const;
  std::size_t size() const;  // of a list or an object
  bool empty() const { return size() == 0; }
  bool is_null() const { return kind_ == Kind::null; }
  const PrintedJson& back() const { return (*this)[size() - 1]; }
  std::vector<PrintedJson>::const_iterator begin() const { return items_.begin(); }
  std::vector<PrintedJson>::const_iterator end() const { return items_.end(); }

  // A number, a truth value, a text or a list as what it is asked for as.
  template <class T>
  T get() const {
    if constexpr (std::same_as<T, bool>) {
      return truth();
    } else if constexpr (std::same_as<T, std::string>) {
      return text();
    } else if constexpr (std::is_arithmetic_v<T>) {
      return static_cast<T>(number());
    } else {
      T list;
      for (const PrintedJson& item : items()) list.push_back(item.get<typename T::value_type>());
      return list;
    }
  }

  // Never equal to what is of another kind.
  bool operator==(const PrintedJson& other) const = default;
  bool operator==(bool value) const { return kind_ == Kind::truth && truth() == value; }
  bool operator==(const std::string& value) const { return kind_ == Kind::text && text_ == value; }
  bool operator==(const char* value) const { return *this == std::string(value); }
  template <class T>
  requires std::is_arithmetic_v<T>
  bool operator==(T value) const { return kind_ == Kind::number && number_ == static_cast<long double>(value); }

  friend std::ostream& operator<<(std::ostream& out, const PrintedJson& json);

 private:
  enum class Kind { null, truth, number, text, list, object };
  struct Reader;

  bool truth() const;
  long double number() const;  // which holds every double and every 64-bit integer
  const std::string& text() const;
  const std::vector<PrintedJson>& items() const;
  void require(Kind kind, const char* name) const;

  Kind kind_ = Kind::null;
  long double number_ = 0.0L;  // of a truth value, 0 or 1
  std::string text_;
  std::vector<std::string> names_;  // of the items of an object
  std::vector<PrintedJson> items_;
};

}  // namespace sm::test
