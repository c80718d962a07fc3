// Rendering of command results: "simple", "table", "json", "xml", "csv" and "keyvalue".
#pragma once

#include <iosfwd>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "zorbel/metaobj.h"

namespace Zorbel::Format {

// Display parameters: the command's defaults ("fields:RECORD", "header:RECORD",
// "units:RECORD.FIELD", "table-columns", "table-columns:RECORD", "wrap-last"), and on top of
// them what the user gives with --format-param: the same keys, and "fields" (the fields of the
// result's own records, in order, for every formatter) and "show-header" (table and csv).
class OutputParameters {
public:
    OutputParameters() = default;
    explicit OutputParameters(std::vector<std::pair<std::string, std::string>> entries)
        : entries_(std::move(entries)) {}

    // A later entry of the same key overrides an earlier one.
    void Set(const std::string& key, const std::string& value);
    std::optional<std::string> Get(const std::string& key) const;

    // Terminal width for "wrap-last"; 0 means $COLUMNS, else 80.
    int columns = 0;

private:
    std::vector<std::pair<std::string, std::string>> entries_;
};

// The names of the formatters, in the order help lists them.
const std::vector<std::string>& FormatterNames();
bool IsFormatter(const std::string& name);

// Checks one display parameter given by the user (--format-param KEY=VALUE): the key must be
// one the formatters know; boolean values ("show-header", "wrap-last") take the forms the
// command line accepts and are rewritten as "true" or "false". Returns an error text, empty
// when the parameter is fine.
std::string CheckFormatParameter(const std::string& key, std::string& value);

// Checks the user's "fields" against the shape of a command's result (the root its OutputSpec
// declares): each name must be a field of the result's records. Returns an error
// text, empty when fine (or when no "fields" was given or the shape is unknown).
std::string CheckFields(const OutputParameters& parameters, const MetaObj::MetaObject* shape);

// Renders root with the named formatter. Unknown names render as "simple".
void Render(const std::string& formatter, const MetaObj::MetaObject& root, const OutputParameters& parameters,
            std::string& out);

// JSON text of a string (with the quotes), escaped as JSON requires; bytes that are not
// valid UTF-8 become U+FFFD.
void AppendJsonString(std::string& out, const std::string& text);

// Text from the host as the simple and table formatters show it: control characters (C0,
// DEL, C1) and bytes that are not UTF-8 are written as escapes (\t, \n, \r, \xNN, \u00NN),
// so that a name cannot drive the terminal.
std::string TerminalSafe(const std::string& text);
// The same for messages of several lines (errors on stderr): line breaks stay as they are,
// everything else a terminal would act on is escaped.
std::string TerminalSafeLines(const std::string& text);

// Splits text into lines of at most width characters at blanks (a longer word stands on a
// line of its own).
std::vector<std::string> WrapText(const std::string& text, std::size_t width);

}  // namespace Zorbel::Format
