// The declaration parser; the real plugin's own declarations are registration_test's.
#include "host/declaration.h"

#include <gtest/gtest.h>

namespace {

using host::ParseDeclaration;
using host::TypeKind;

TEST(Declaration, ParsesNamesParametersByRefAndResult) {
  std::string error;
  auto d = ParseDeclaration(
      "getallsix(byref n1 as integer, byref n2 as integer, byref n3 as integer, byref n4 as integer, "
      "byref n5 as integer, byref n6 as integer)",
      &error);
  ASSERT_TRUE(d) << error;
  EXPECT_EQ(d->name, "getallsix");
  ASSERT_EQ(d->parameters.size(), 6u);
  for (const auto& p : d->parameters) {
    EXPECT_TRUE(p.byRef);
    EXPECT_EQ(p.type.kind, TypeKind::Integer);
  }
  EXPECT_FALSE(d->result);

  d = ParseDeclaration("TagData(index as Integer) as String", &error);
  ASSERT_TRUE(d) << error;
  EXPECT_EQ(d->parameters[0].name, "index");
  EXPECT_FALSE(d->parameters[0].byRef);
  ASSERT_TRUE(d->result);
  EXPECT_EQ(d->result->kind, TypeKind::String);

  d = ParseDeclaration("GetMFT(tag as String) as Clut", &error);
  ASSERT_TRUE(d) << error;
  EXPECT_EQ(d->result->kind, TypeKind::Object);
  EXPECT_EQ(d->result->className, "Clut");

  d = ParseDeclaration("  GetIndNamedColorPCS(index as Integer, byref Ll as double,byref La as double,"
                       "byref Lb as double)  ",
                       &error);
  ASSERT_TRUE(d) << error;
  EXPECT_EQ(d->parameters.size(), 4u);
  EXPECT_EQ(d->parameters[3].type.kind, TypeKind::Double);

  d = ParseDeclaration("reset()", &error);
  ASSERT_TRUE(d) << error;
  EXPECT_TRUE(d->parameters.empty());

  d = ParseDeclaration("Matte(v as BOOLEAN, c as color, x as ByValue) AS integer", &error);
  ASSERT_TRUE(d) << error;
  EXPECT_EQ(d->parameters[0].type.kind, TypeKind::Boolean);
  EXPECT_EQ(d->parameters[1].type.kind, TypeKind::Color);
  EXPECT_EQ(d->parameters[2].type.className, "ByValue");  // a class named like a keyword
  EXPECT_EQ(d->result->kind, TypeKind::Integer);
}

TEST(Declaration, RefusesMalformedText) {
  const char* bad[] = {"", "()", "1abc()", "name", "name(", "name(a as Integer", "name(a Integer)", "name(a as)",
                       "name(as Integer)", "name(a as Integer,)", "name(a as Integer b as Integer)", "name() as",
                       "name() as Integer extra", "name(byref as Integer)", "name(as as Integer)", "na-me()"};
  for (const char* text : bad) {
    std::string error;
    EXPECT_FALSE(ParseDeclaration(text, &error)) << text;
    EXPECT_FALSE(error.empty()) << text;
  }
}

}  // namespace
