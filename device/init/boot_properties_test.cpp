#include "device/init/boot_properties.h"

#include <gtest/gtest.h>

namespace sentrova::device {
namespace {

using Properties = std::vector<Property>;

TEST(ParsePropertyText, TakesNameValueLines) {
  EXPECT_EQ(parse_property_text("# comment = no\n\nro.a=1\n  ro.b = two words \nno value\nro.c=\n"
                                "ro.d=x=y"),
            (Properties{{"ro.a", "1"}, {"ro.b", "two words"}, {"ro.c", ""}, {"ro.d", "x=y"}}));
}

TEST(ParseCommandLine, TakesOnlyPrefixedWords) {
  EXPECT_EQ(parse_command_line("console=ttyAMA0 prop.ro.a=1 quiet prop.novalue  xprop.b=2 "
                               "prop.c=x=y\n"),
            (Properties{{"ro.a", "1"}, {"c", "x=y"}}));
  EXPECT_TRUE(parse_command_line("").empty());
}

}  // namespace
}  // namespace sentrova::device
