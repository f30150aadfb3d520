// Numbers of workbooks as text: catches what would no longer be found as people see it in a cell.

#include "services/kovacontentextractd/readers/cell_numbers.h"

#include <string>

#include <gtest/gtest.h>

namespace ferrox::extract::test {

TEST(CellNumbersTest, NumbersAreFoundAsTheyAreAndAsTheyAreShown) {
  const struct {
    double value;
    const char* format;
    std::string text;
  } kRows[] = {
      {1234567.891, "#,##0.00", "1234567.891 1,234,567.89"},
      {-1234.5, "#,##0;[Red](#,##0)", "-1234.5 -1,234"},
      {0.153, "0.0%", "0.153 15.3%"},
      {2, "\"USD\" 0.00_)", "2 2.00"},
      {45352, "[$-409]d\\-mmm\\-yy;@", "2024-03-01"},
      {13100501, "dd/mm/yyyy", "13100501"},
      {0.125, "# ?/?", "0.125"},
      {1500000, "0.0,,", "1500000"},
      {1e300, "0.00", "1e+300"},
      {12, "General", "12"},
  };
  for (const auto& row : kRows) EXPECT_EQ(NumberText(row.value, ParseNumberFormat(row.format), false), row.text);
  EXPECT_EQ(NumberText(0.5, BuiltInNumberFormat(9), false), "0.5 50%");
  EXPECT_EQ(NumberText(1234.5, BuiltInNumberFormat(4), false), "1234.5 1,234.50");
  EXPECT_EQ(NumberText(4711, BuiltInNumberFormat(49), false), "4711") << "text";
  EXPECT_EQ(NumberText(1234.5, BuiltInNumberFormat(11), false), "1234.5") << "powers of ten";
}

}  // namespace ferrox::extract::test
