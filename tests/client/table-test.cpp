#include "client/table.h"

#include <gtest/gtest.h>
#include <json/value.h>

#include "client/json-output.h"
#include "ipc/pobject.h"

namespace {

const Terminal PIPE(-1);

}  // namespace

TEST(TableTest, ColumnsAreAlignedAndLinesHaveNoBlanksAtTheEnd) {
    Table table({"ID", "NAME", "TO"});
    table.Add({"1", "写真", "/photos"});
    table.Add({"12", "x", "/"});
    EXPECT_EQ(
        "ID  NAME  TO\n"
        "1   写真  /photos\n"
        "12  x     /\n",
        table.Text(PIPE));
}

TEST(TableTest, NoRowsGiveTheHeadings) { EXPECT_EQ("ID\n", Table({"ID"}).Text(PIPE)); }

TEST(TableTest, ThereIsNoColourInAPipe) {
    Table table({"STATUS"});
    table.Add({Table::Cell("failed", Colour::RED)});
    EXPECT_EQ("STATUS\nfailed\n", table.Text(PIPE));
}

TEST(JsonOutputTest, ValuesOfTheDaemonAsJson) {
    PObject task;
    task["id"] = 3;
    task["run_when_plug_in"] = 1;
    task["schedule_id"] = -1;
    task["task_name"] = "caf\xE9 \"x\"\n";
    PObject::array_type list = {PObject(1), PObject("a")};
    task["list"] = list;
    EXPECT_EQ(
        "{\"id\":3,\"list\":[1,\"a\"],\"run_when_plug_in\":true,\"schedule_id\":-1,"
        "\"task_name\":\"caf\uFFFD \\\"x\\\"\\n\"}",
        JsonLine(ToJson(task)));
}
