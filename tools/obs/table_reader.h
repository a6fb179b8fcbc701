#ifndef KARNET_TOOLS_OBS_TABLE_READER_H_
#define KARNET_TOOLS_OBS_TABLE_READER_H_

#include <istream>
#include <string>
#include <vector>

#include "obs/observation.h"

namespace karnet::obs {

// Splits one line of a table at the delimiter (' ' means runs of blanks), honouring double
// quotes ("a ""quoted"" text"). Fields are trimmed.
std::vector<std::string> splitFields(const std::string& line, char delimiter);

// The delimiter of a header line: tab, semicolon or comma, whichever occurs most outside quotes
// (in that order on a tie); ' ' when there is none of them.
char detectDelimiter(const std::string& header);

// Reads a table with a header of named columns (comma, tab, semicolon or blank separated; lines
// starting with '#' and blank lines are passed over) and hands every data row to sink. name is
// used in messages. Throws ObsError for a missing or ambiguous column, a row with too few
// fields, or text that is not a number (unless options.skipBadText).
void readTable(std::istream& in, const std::string& name, const ReadOptions& options,
               const RowSink& sink);

}  // namespace karnet::obs

#endif  // KARNET_TOOLS_OBS_TABLE_READER_H_
