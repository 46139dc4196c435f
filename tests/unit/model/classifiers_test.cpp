#include <gtest/gtest.h>

#include "viraduve/records.h"

namespace viraduve {
namespace {

TEST(Classifiers, ImageModeFirstSubstringHitWins) {
  const struct { const char* text; ImageMode mode; } cases[] = {
      {"chemi", ImageMode_Chemi},          {"CHEMI fluo", ImageMode_Chemi},
      {"uv dna", ImageMode_UV},            {"DNA", ImageMode_UV_WHITE},
      {"vis uv", ImageMode_Vis},           {"Fluorescence", ImageMode_Fluo},
      {"universal", ImageMode_Universal},  {"", ImageMOde_Other},
      {"Unknown", ImageMOde_Other},        {"Protein", ImageMode_Protein},
  };
  for (const auto& c : cases) EXPECT_EQ(toImageMode(c.text), c.mode) << c.text;
}

TEST(Classifiers, ChannelTypeFirstSubstringHitWins) {
  EXPECT_EQ(toChannelType(""), ChType_Live);
  EXPECT_EQ(toChannelType("Membrane"), ChType_Membrane);
  EXPECT_EQ(toChannelType("uv"), ChType_NA);
  EXPECT_EQ(toChannelType("fluo chemi"), ChType_Fluo);
  EXPECT_EQ(toChannelType("protein vis"), ChType_Vis);
}

TEST(Classifiers, NamesAndOutOfRange) {
  EXPECT_EQ(imageModeName(7), "ImageMode Out of range");
  EXPECT_EQ(imageModeName(10), "ImageMode_UV_WHITE");
  EXPECT_EQ(imageModeName(6), "ImageMOde_Other");
  EXPECT_EQ(channelTypeName(7), "ChannelType Out of range");
  EXPECT_EQ(channelTypeName(4), "ChType_NA");
}

TEST(Classifiers, EqualsNoCase) {
  EXPECT_FALSE(equalsNoCase("", ""));
  EXPECT_FALSE(equalsNoCase("a", ""));
  EXPECT_TRUE(equalsNoCase("Lane-7A", "lane-7a"));
  EXPECT_FALSE(equalsNoCase("abc", "abcd"));
  EXPECT_FALSE(equalsNoCase("\xC3\x84", "\xC3\xA4"));  // only ASCII letters fold
}

}  // namespace
}  // namespace viraduve
