// Tables of numbers and names, as users write them.
#include "transport/collection/name_table.h"

#include "tests/support/temp_folder.h"
#include "tests/support/test.h"

namespace kral {
namespace {

// "id=name" of each row, or what is wrong.
std::string Parsed(std::string_view text) {
  NameTableFault fault;
  const auto table = NameTable::Parse(text, fault);
  if (!table) return fault.text;
  std::string rows;
  for (const auto& row : table->rows()) rows += std::to_string(row.id) + "=" + row.name + ";";
  return rows;
}

TEST(NameTable, ReadsWhatUsersWrite) {
  using std::string_view_literals::operator""sv;
  const struct {
    std::string_view text;
    std::string_view rows;
  } cases[] = {
      {"", ""},
      {"\xEF\xBB\xBF# names\r\n\r\n  7  Band change \r\n", "7=Band change;"},
      {"0x10 a\n0XFFFF, b\n3\tc\n4,d , e\n5 , f", "16=a;65535=b;3=c;4=d , e;5=f;"},
      {"9\n8", "9=;8=;"},
      {"1 a\n65536 b", "line 2: no id from 0 to 65535"},
      {"-1 a", "line 1: no id from 0 to 65535"},
      {"\n12a b", "line 2: no id from 0 to 65535"},
      {"0x a", "line 1: no id from 0 to 65535"},
      {"1 a\n0x1 b", "line 2: the id stands twice"},
      {"1 a\0b"sv, "line 1: not a text"},
  };
  for (const auto& c : cases) EXPECT_EQ(Parsed(c.text), c.rows) << c.text;
  EXPECT_EQ(Parsed("1 " + std::string(255, 'x')).size(), 258u);
  EXPECT_EQ(Parsed("1 " + std::string(256, 'x')), "line 1: the name is too long");
  NameTableFault fault;
  EXPECT_EQ(NameTable::Load("/nonexistent", fault), nullptr);
  EXPECT_NE(fault.text, "");
  EXPECT_EQ(fault.line, 0u);
  EXPECT_TRUE(fault.system_error);
}

TEST(NameTables, ListWithoutRowsAllowsEverything) {
  NameTables tables;
  EXPECT_TRUE(tables.Allows(NameTableKind::kAllowedLogs, 5));
  NameTableFault fault;
  tables.Set(NameTableKind::kAllowedLogs, NameTable::Parse("4", fault));
  EXPECT_FALSE(tables.Allows(NameTableKind::kAllowedLogs, 5));
  EXPECT_TRUE(tables.Allows(NameTableKind::kAllowedLogs, 4));
  EXPECT_TRUE(tables.Allows(NameTableKind::kAllowedEvents, 5)) << "another table";
  tables.Set(NameTableKind::kAllowedLogs, nullptr);
  EXPECT_TRUE(tables.Allows(NameTableKind::kAllowedLogs, 5));
}

}  // namespace
}  // namespace kral
