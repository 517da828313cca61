#include "mixed/svg.hpp"

#include <gtest/gtest.h>

#include <map>

#include "mixed/example_fit.hpp"
#include "mixed/text.hpp"
#include "mixed/xml.hpp"

namespace sm::mixed::test {
namespace {

TEST(Xml, tells_a_document_that_is_not_well_formed) {
  EXPECT_EQ(parsed_xml("<?xml version=\"1.0\"?>\n<a b=\"1\"><c/>x &lt; y</a>\n").fault, "");
  EXPECT_EQ(parsed_xml("<a>x &lt; y</a>").elements[0].text, "x < y");
  EXPECT_EQ(parsed_xml("<a><b></a></b>").fault, "an end tag without its start");
  EXPECT_EQ(parsed_xml("<a>").fault, "unclosed a");
  EXPECT_EQ(parsed_xml("<a>R&D</a>").fault, "a bare &");
  EXPECT_EQ(parsed_xml("<a b=\"<\"/>").fault, "a bare <");
  EXPECT_EQ(parsed_xml("<a b=1/>").fault, "an attribute without a quoted value");
  EXPECT_EQ(parsed_xml("<a b=\"1\" b=\"2\"/>").fault, "a repeated attribute b");
  EXPECT_EQ(parsed_xml("<a/><b/>").fault, "a second root");
  EXPECT_EQ(parsed_xml("<a>\x07</a>").fault, "a control character");
  EXPECT_EQ(parsed_xml("<a>\xff</a>").fault, "a byte that is not UTF-8");
  EXPECT_EQ(parsed_xml("").fault, "no element");
}

TEST(Canvas, writes_any_text_as_well_formed_markup) {
  for (const std::string& name : hostile_names()) {
    svg::Canvas canvas(200.0, 100.0, name);
    canvas.text(10.0, 20.0, name, {.anchor = svg::Anchor::end, .bold = true, .upwards = true});
    const Document document = parsed_xml(canvas.finished());
    EXPECT_EQ(document.fault, "") << name;
    EXPECT_EQ(named(document, "title")[0].text, printable(name));
    EXPECT_EQ(named(document, "text")[0].text, printable(name));
  }
}

TEST(Canvas, has_the_size_and_the_shapes_that_were_asked_for) {
  svg::Canvas canvas(640.0, 480.5, "t");
  canvas.line(0.0, 1.0, 2.345, 1e-4, svg::kInk);
  canvas.begin_circles(svg::kAccent, 0.5);
  canvas.circle(1.0, 2.0, 3.0);
  canvas.end_group();
  const Document document = parsed_xml(canvas.finished());
  EXPECT_EQ(document.fault, "");
  EXPECT_EQ(document.elements[0].attributes.at("viewBox"), "0 0 640 480.5");
  EXPECT_EQ(document.elements[0].attributes.at("xmlns"), "http://www.w3.org/2000/svg");
  EXPECT_EQ(named(document, "path")[0].attributes.at("d"), "M0 1L2.35 0");
  EXPECT_EQ(named(document, "circle")[0].attributes.at("r"), "3");
  EXPECT_EQ(named(document, "g")[0].attributes.at("fill-opacity"), "0.5");
}

TEST(SvgText, is_cut_in_the_middle_to_the_width_there_is) {
  EXPECT_EQ(svg::fitted("short", 10.0, 100.0), "short");
  const std::string cut = svg::fitted("experimental station 17", 10.0, 60.0);
  EXPECT_LE(svg::text_width(cut, 10.0), 60.0);
  EXPECT_GE(svg::text_width(cut, 10.0), 45.0);
  EXPECT_TRUE(cut.starts_with("exp"));
  EXPECT_TRUE(cut.ends_with("17"));
  EXPECT_NE(cut.find("…"), std::string::npos);
  EXPECT_EQ(svg::fitted("two\nlines", 10.0, 500.0), "two\\nlines");
  for (const std::string& name : hostile_names()) EXPECT_LE(svg::text_width(svg::fitted(name, 9.0, 80.0), 9.0), 80.0);
}

TEST(SvgText, is_cut_around_what_tells_names_apart_that_would_look_alike) {
  const std::vector<std::string> names{"Experimental station Höhe, upper terrace, bed 01 of the long-term trial",
                                       "Experimental station Höhe, upper terrace, bed 02 of the long-term trial",
                                       "Experimental station Höhe, upper terrace, bed 13 of the long-term trial",
                                       "short", "Another station of the same length, or nearly, in another country"};
  const std::vector<std::string> shown = svg::told_apart(names, 10.0, 120.0);
  ASSERT_EQ(shown.size(), names.size());
  for (const auto& [place, number] : std::map<std::size_t, std::string>{{0, "bed 01"}, {1, "bed 02"}, {2, "bed 13"}}) {
    EXPECT_NE(shown[place].find(number), std::string::npos) << shown[place];
    EXPECT_TRUE(shown[place].starts_with("…") && shown[place].ends_with("…")) << shown[place];
  }
  for (const std::string& text : shown) EXPECT_LE(svg::text_width(text, 10.0), 120.0) << text;
  EXPECT_EQ(shown[3], "short");
  EXPECT_EQ(shown[4], svg::fitted(names[4], 10.0, 120.0));
  const std::vector<std::string> twice{names[0], names[0]};  // the same name twice stays the same
  EXPECT_EQ(svg::told_apart(twice, 10.0, 120.0)[1], svg::fitted(names[0], 10.0, 120.0));
  const std::vector<std::string> longer{std::string(155, 'a'), std::string(150, 'a')};  // one begins as the other
  for (const std::string& text : svg::told_apart(longer, 10.0, 120.0)) EXPECT_LE(svg::text_width(text, 10.0), 120.0);
  for (const std::string& name : hostile_names()) {
    for (const std::string& text : svg::told_apart({name + "a", name + "b"}, 9.0, 80.0)) {
      EXPECT_LE(svg::text_width(text, 9.0), 80.0) << text;
      EXPECT_EQ(parsed_xml("<a>" + svg::escaped(text) + "</a>").fault, "");
    }
  }
}

TEST(SvgText, has_coordinates_to_a_hundredth) {
  EXPECT_EQ(svg::coordinate(1.0), "1");
  EXPECT_EQ(svg::coordinate(-0.001), "0");
  EXPECT_EQ(svg::coordinate(12.346), "12.35");
  EXPECT_EQ(svg::coordinate(100.5), "100.5");
}

}  // namespace
}  // namespace sm::mixed::test
