// Columns in bytes, units of UTF-16 and code points, there and back, for any bytes.
#include "foundations/columns.h"

#include <gtest/gtest.h>

#include <string>

namespace quillet {
namespace {

constexpr Text kLine = "a\tä€😀z";  // 1, 1, 2, 3, 4 and 1 bytes

TEST(Columns, CountUnits) {
  EXPECT_EQ(UnitsOf(kLine, ColumnUnit::kUtf8), 12u);
  EXPECT_EQ(UnitsOf(kLine, ColumnUnit::kUtf16), 7u);
  EXPECT_EQ(UnitsOf(kLine, ColumnUnit::kUtf32), 6u);
  EXPECT_EQ(UnitsOf(Text(""), ColumnUnit::kUtf16), 0u);
}

TEST(Columns, GoBackToTheBytesInFront) {
  const size_t utf16[] = {0, 1, 2, 4, 7, 7, 11, 12, 12};
  for (size_t unit = 0; unit < std::size(utf16); ++unit)
    EXPECT_EQ(BytesOfUnits(kLine, unit, ColumnUnit::kUtf16), utf16[unit]) << unit;
  const size_t utf32[] = {0, 1, 2, 4, 7, 11, 12, 12};
  for (size_t unit = 0; unit < std::size(utf32); ++unit)
    EXPECT_EQ(BytesOfUnits(kLine, unit, ColumnUnit::kUtf32), utf32[unit]) << unit;
  const size_t utf8[] = {0, 1, 2, 2, 4, 4, 4, 7, 7, 7, 7, 11, 12, 12};
  for (size_t unit = 0; unit < std::size(utf8); ++unit)
    EXPECT_EQ(BytesOfUnits(kLine, unit, ColumnUnit::kUtf8), utf8[unit]) << unit;
}

TEST(Columns, AreThereForAnyBytes) {
  const std::string bytes =
      "a\x80\xFF\xE2\x82"
      "b";
  for (const ColumnUnit unit : {ColumnUnit::kUtf8, ColumnUnit::kUtf16, ColumnUnit::kUtf32}) {
    const size_t units = UnitsOf(bytes, unit);
    size_t before = 0;
    for (size_t i = 0; i <= units; ++i) {
      const size_t at = BytesOfUnits(bytes, i, unit);
      EXPECT_GE(at, before);
      EXPECT_LE(at, bytes.size());
      before = at;
    }
    EXPECT_EQ(before, bytes.size());
  }
}

}  // namespace
}  // namespace quillet
