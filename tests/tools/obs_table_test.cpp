// karnet-obs: tables with named columns.
#include <gtest/gtest.h>

#include <sstream>
#include <string>
#include <utility>
#include <vector>

#include "obs/table_reader.h"

namespace karnet::obs {
namespace {

struct Read {
  std::vector<Row> rows;
  std::vector<std::string> where;
};

Read readText(const std::string& text, const ReadOptions& options = {}) {
  std::istringstream in(text);
  Read out;
  readTable(in, "t.csv", options, [&out](const Row& row, const Where& where) {
    out.rows.push_back(row);
    out.where.push_back(where());
  });
  return out;
}

std::string errorOf(const std::string& text, const ReadOptions& options = {}) {
  try {
    readText(text, options);
  } catch (const ObsError& e) {
    return e.what();
  }
  return "(no error)";
}

TEST(ObsTable, SplittingAndDelimiters) {
  EXPECT_EQ(splitFields(" a , \"b, c\" ,\"d \"\"e\"\"\",", ','),
            (std::vector<std::string>{"a", "b, c", "d \"e\"", ""}));
  EXPECT_EQ(splitFields("  1.5\t 2   x  ", ' '), (std::vector<std::string>{"1.5", "2", "x"}));
  EXPECT_EQ(detectDelimiter("lon\tlat\tdepth,m\tvalue"), '\t');
  EXPECT_EQ(detectDelimiter("lon;lat;\"a,b\";value"), ';');
  EXPECT_EQ(detectDelimiter("lon,lat,depth,value"), ',');
  EXPECT_EQ(detectDelimiter("lon lat depth value"), ' ');
}

// The same two measurements in any column order, delimiter, name case or unit annotation.
TEST(ObsTable, ColumnsFoundByName) {
  const std::pair<std::string, ReadOptions> cases[] = {
      {"lon,lat,depth,value\n10.5,55.25,3,7.5\n11,56,12.5,-1\n", {}},
      {"# made by hand\n\nValue;Depth [m];Latitude;Longitude\n7,5;3;55,25;10,5\n-1;12,5;56;11\n",
       {}},
      {"\xEF\xBB\xBFtemp\tLAT\tlon\tdepth\r\n7.5\t55.25\t10.5\t3\r\n-1\t56\t11\t12.5", {}},
      {"station x y depth temp\nA 10.5 55.25 3 7.5\nB 11 56 12.5 -1\n",
       [] {
         ReadOptions o;
         o.lonColumn = "X";
         o.latColumn = "y";
         o.valueColumn = "temp";
         return o;
       }()},
  };
  for (const auto& [text, options] : cases) {
    const Read r = readText(text, options);
    ASSERT_EQ(r.rows.size(), 2u) << text;
    EXPECT_EQ(r.rows[0].lon, 10.5) << text;
    EXPECT_EQ(r.rows[0].lat, 55.25) << text;
    EXPECT_EQ(r.rows[0].vertical, 3.0) << text;
    EXPECT_EQ(r.rows[0].value, 7.5) << text;
    EXPECT_EQ(r.rows[1].vertical, 12.5) << text;
    EXPECT_EQ(r.rows[1].value, -1.0) << text;
    EXPECT_FALSE(r.rows[0].isPressure);
    EXPECT_EQ(r.rows[1].skip, Skip::None);
  }
}

TEST(ObsTable, PressureTimeAndFlags) {
  ReadOptions options;
  options.needTime = true;
  options.qcColumn = "flag";
  const Read r = readText(
      "Time,PRES,lat,lon,psal,flag\n"
      "2007-05-01T12:00:00Z,100,40,-60,35.1,1\n"
      "2007-05-02,200,40,-60,35.2,4\n"
      "2007-05-03,NaN,40,-60,35.3,1\n"
      ",300,40,-60,35.4,1\n"
      "2007-05-04,400,40,-60,99999,1\n"
      "2007-05-05,500,40,-60,35.6,\n",
      options);
  ASSERT_EQ(r.rows.size(), 6u);
  EXPECT_TRUE(r.rows[0].isPressure);
  EXPECT_EQ(r.rows[0].vertical, 100.0);
  EXPECT_EQ(r.rows[0].value, 35.1);
  EXPECT_EQ(*r.rows[0].time, 20939.5);  // days from 1950-01-01 to 2007-05-01, and a half
  EXPECT_EQ(r.rows[0].skip, Skip::None);
  EXPECT_EQ(r.rows[1].skip, Skip::BadQc);
  EXPECT_EQ(r.rows[2].skip, Skip::Missing);
  EXPECT_EQ(r.rows[3].skip, Skip::Missing);  // no time although a window needs it
  EXPECT_EQ(r.rows[4].skip, Skip::Missing);
  EXPECT_EQ(r.rows[5].skip, Skip::BadQc);    // no flag: "no QC performed"
  EXPECT_EQ(r.where[4], "t.csv:6");
  // Depth wins over pressure when both are there and neither is named.
  EXPECT_FALSE(readText("lon,lat,pres,depth,v\n1,2,30,29.8,5\n").rows[0].isPressure);
  // Another fill value, given by the user.
  ReadOptions fill;
  fill.fillValues.push_back(-999.0);
  EXPECT_EQ(readText("lon,lat,depth,v\n1,2,3,-999\n", fill).rows[0].skip, Skip::Missing);
}

TEST(ObsTable, FaultsAreNamed) {
  const std::pair<std::string, const char*> cases[] = {
      {"lon,lat,depth,value\n1,2,3,4\n1,2x,3,4\n",
       "t.csv:3: not a number in column 'lat': \"2x\""},
      {"lon,lat,depth,value\n1,2,3,inf\n", "t.csv:2: not a number in column 'value'"},
      {"lon,lat,depth,value\n1,2,3\n", "t.csv:2: 3 fields, 4 needed"},
      {"lat,depth,value\n1,2,3\n", "no longitude column"},
      {"lon,lat,value\n1,2,3\n", "no depth or pressure column"},
      {"lon,lat,depth,temp,psal\n1,2,3,4,5\n", "which column holds the values?"},
      {"lon,lat,depth,value,Value\n1,2,3,4,5\n", "two columns are named 'Value'"},
      {"# only a comment\n", "no header line"},
      {std::string("\x1f\x8b\x08\0lon,lat\n", 12), "t.csv:1: not a text table"},
  };
  for (const auto& [text, expected] : cases) {
    const std::string error = errorOf(text);
    EXPECT_NE(error.find(expected), std::string::npos) << text << "\nmessage: " << error;
  }
  ReadOptions named;
  named.pressureColumn = "dbar";
  EXPECT_NE(errorOf("lon,lat,depth,value\n1,2,3,4\n", named).find("no column 'dbar' for the pressure"),
            std::string::npos);
  ReadOptions window;
  window.needTime = true;
  EXPECT_NE(errorOf("lon,lat,depth,value\n1,2,3,4\n", window).find("no time column"),
            std::string::npos);
  EXPECT_NE(errorOf("lon,lat,depth,value,time\n1,2,3,4,May 1\n", window)
                .find("t.csv:2: not an ISO date or time in column 'time': \"May 1\""),
            std::string::npos);
}

TEST(ObsTable, SkipBadCountsInsteadOfStopping) {
  ReadOptions options;
  options.skipBadText = true;
  const Read r = readText("lon,lat,depth,value\n1,2,3,4\n1,2,x,4\n1,2\n5,6,7,8\n", options);
  ASSERT_EQ(r.rows.size(), 4u);
  EXPECT_EQ(r.rows[0].skip, Skip::None);
  EXPECT_EQ(r.rows[1].skip, Skip::Unparsable);
  EXPECT_EQ(r.rows[2].skip, Skip::Unparsable);
  EXPECT_EQ(r.rows[3].skip, Skip::None);
  EXPECT_EQ(r.rows[3].value, 8.0);
}

}  // namespace
}  // namespace karnet::obs
