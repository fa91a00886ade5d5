// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/sql/RowWriter.h"

#include <gtest/gtest.h>
#include <limits>
#include <sstream>

#include "tools/twctl/sql/StoreFixture.h"

namespace tonewerk {
namespace {

class RowWriterTest : public testing::Test {
 protected:
  RowWriterTest() { EXPECT_EQ(reader.open(fixture.file()), ""); }

  std::string written(const RowFormat& format, const std::vector<std::string>& columns,
                      const std::vector<std::vector<SqlValue>>& rows) {
    std::ostringstream out;
    const auto writer = makeRowWriter(format, reader, out);
    writer->begin(columns);
    for (const auto& row : rows) writer->add(row);
    writer->end();
    return out.str();
  }

  StoreFixture fixture;
  SqlReader reader;
  const RowFormat table{};
  const RowFormat json{RowFormat::Kind::kJson, {}, false};
  const RowFormat csv{RowFormat::Kind::kCsv, {}, false};
  const std::vector<SqlValue> ofEachKind{SqlValue(), std::int64_t{-5}, 1763633880.25, "text",
                                         SqlBytes{"\x0a\xff"}};
};

TEST_F(RowWriterTest, WritesATableInWhichNullIsNothing) {
  EXPECT_EQ(written(table, {"a", "b", "c", "d", "e"}, {ofEachKind}),
            "a  b   c              d     e\n"
            "   -5  1763633880.25  text  0aff\n");
}

TEST_F(RowWriterTest, FitsATableIntoTheTerminal) {
  EXPECT_EQ(written({RowFormat::Kind::kTable, 12, false}, {"a"}, {{"0123456789abcdef"}}),
            "a\n0123456789a\u2026\n");
}

TEST_F(RowWriterTest, WritesTypedJson) {
  EXPECT_EQ(written(json, {"a", "b", "c", "d", "e"}, {ofEachKind}),
            "{\"a\":null,\"b\":-5,\"c\":1763633880.25,\"d\":\"text\",\"e\":\"0aff\"}\n");
  EXPECT_EQ(written(json, {"a"}, {{std::numeric_limits<double>::infinity()}}), "{\"a\":null}\n");
}

TEST_F(RowWriterTest, WritesAPayloadAsJsonAndNotAsText) {
  EXPECT_EQ(written(json, {"payload", "name"}, {{"{\"a\":\n1.50}", "{\"a\":1}"}}),
            "{\"payload\":{\"a\":1.50},\"name\":\"{\\\"a\\\":1}\"}\n");
}

TEST_F(RowWriterTest, WritesAPayloadThatIsNoObjectAsText) {
  EXPECT_EQ(
      written(json, {"payload"}, {{"{\"a\":"}, {"true"}, {SqlBytes{"{}"}}, {SqlValue()}}),
      "{\"payload\":\"{\\\"a\\\":\"}\n{\"payload\":\"true\"}\n{\"payload\":\"7b7d\"}\n{\"payload\":null}\n");
}

TEST_F(RowWriterTest, WritesCsvAsRfc4180) {
  EXPECT_EQ(written(csv, {"a", "b", "c", "d", "e"}, {ofEachKind}),
            "a,b,c,d,e\r\n,-5,1763633880.25,text,0aff\r\n");
  EXPECT_EQ(written(csv, {"x,y", "z"}, {{"say \"a\"", "two\r\nlines"}, {"", SqlValue()}}),
            "\"x,y\",z\r\n\"say \"\"a\"\"\",\"two\r\nlines\"\r\n\"\",\r\n");
}

// Many readers skip an empty line, so that there were fewer rows.
TEST_F(RowWriterTest, CsvHasNoEmptyLineForNullInTheOnlyColumn) {
  EXPECT_EQ(written(csv, {"a"}, {{SqlValue()}, {"b"}}), "a\r\n\"\"\r\nb\r\n");
  EXPECT_EQ(written(csv, {"a", "b"}, {{SqlValue(), SqlValue()}}), "a,b\r\n,\r\n");
}

TEST_F(RowWriterTest, WritesTheHeaderOfACsvWithoutRows) {
  EXPECT_EQ(written(csv, {"a", "b"}, {}), "a,b\r\n");
}

TEST_F(RowWriterTest, CsvForATerminalControlsNoTerminal) {
  EXPECT_EQ(written({RowFormat::Kind::kCsv, {}, true}, {"a"}, {{"\x1b[2J"}}), "a\r\n\\u001b[2J\r\n");
  EXPECT_EQ(written(csv, {"a"}, {{"\x1b[2J"}}), "a\r\n\x1b[2J\r\n");
}

}  // namespace
}  // namespace tonewerk
