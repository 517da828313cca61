// Enough of XML to tell a well-formed document from one that is not, and to look at its elements.
#pragma once

#include <map>
#include <string>
#include <string_view>
#include <vector>

namespace sm::mixed::test {

struct Element {
  std::string name;
  std::map<std::string, std::string> attributes;  // as written
  std::string text;                               // of its own, entities resolved
};

struct Document {
  std::vector<Element> elements;  // in the order of their start tags
  std::string fault;              // empty: well-formed; else what is not
};

// Elements with quoted attributes, the five predefined entities, a declaration; no comments, no sections, no doctype.
Document parsed_xml(std::string_view text);

// Of the elements of one name.
std::vector<Element> named(const Document& document, const std::string& name);

}  // namespace sm::mixed::test
