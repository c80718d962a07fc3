#include "zorbel/formatter.h"

#include <algorithm>
#include <cctype>
#include <charconv>
#include <cstdlib>
#include <iterator>
#include <string>
#include <string_view>

namespace Zorbel::Format {

using MetaObj::MetaBool;
using MetaObj::MetaInt;
using MetaObj::MetaList;
using MetaObj::MetaObject;
using MetaObj::MetaString;
using MetaObj::MetaStruct;

void OutputParameters::Set(const std::string& key, const std::string& value) {
    for (auto& entry : entries_) {
        if (entry.first == key) {
            entry.second = value;
            return;
        }
    }
    entries_.emplace_back(key, value);
}

std::optional<std::string> OutputParameters::Get(const std::string& key) const {
    for (auto it = entries_.rbegin(); it != entries_.rend(); ++it) {
        if (it->first == key) return it->second;
    }
    return std::nullopt;
}

const std::vector<std::string>& FormatterNames() {
    static const std::vector<std::string> names{"simple", "table", "json", "xml", "csv", "keyvalue"};
    return names;
}

bool IsFormatter(const std::string& name) {
    const auto& names = FormatterNames();
    return std::find(names.begin(), names.end(), name) != names.end();
}

std::vector<std::string> WrapText(const std::string& text, std::size_t width) {
    std::vector<std::string> lines;
    if (width == 0) width = 1;
    std::string line;
    std::size_t pos = 0;
    while (pos < text.size()) {
        if (text[pos] == '\n') {
            lines.push_back(line);
            line.clear();
            ++pos;
            continue;
        }
        if (text[pos] == ' ') {
            ++pos;
            continue;
        }
        std::size_t end = text.find_first_of(" \n", pos);
        if (end == std::string::npos) end = text.size();
        std::string_view word(text.data() + pos, end - pos);
        if (!line.empty() && line.size() + 1 + word.size() > width) {
            lines.push_back(line);
            line.clear();
        }
        if (!line.empty()) line += ' ';
        line.append(word);
        pos = end;
    }
    if (!line.empty() || lines.empty()) lines.push_back(line);
    return lines;
}

namespace {

// The length of the well-formed UTF-8 sequence at p (2 to 4 bytes), or 0 when there is none:
// a stray continuation byte, a cut sequence, an overlong form, a surrogate or a value past
// U+10FFFF.
std::size_t Utf8SequenceLength(const unsigned char* p, std::size_t remaining) {
    unsigned char c = p[0];
    std::size_t length = 0;
    unsigned int codePoint = 0;
    if (c >= 0xC2 && c <= 0xDF) {
        length = 2;
        codePoint = c & 0x1F;
    } else if (c >= 0xE0 && c <= 0xEF) {
        length = 3;
        codePoint = c & 0x0F;
    } else if (c >= 0xF0 && c <= 0xF4) {
        length = 4;
        codePoint = c & 0x07;
    }
    if (length == 0 || length > remaining) return 0;
    for (std::size_t k = 1; k < length; ++k) {
        if ((p[k] & 0xC0) != 0x80) return 0;
        codePoint = (codePoint << 6) | (p[k] & 0x3F);
    }
    if ((length == 3 && codePoint < 0x800) || (length == 4 && codePoint < 0x10000) ||
        (codePoint >= 0xD800 && codePoint <= 0xDFFF) || codePoint > 0x10FFFF)
        return 0;
    return length;
}

// The decimal text of an integer, signed or unsigned, appended to out.
void AppendInteger(std::string& out, const MetaObject* value) {
    const auto* integer = static_cast<const MetaInt*>(value);
    char digits[24];
    const auto end = integer->IsUnsigned()
                         ? std::to_chars(digits, digits + sizeof(digits), integer->GetUnsigned())
                         : std::to_chars(digits, digits + sizeof(digits), integer->Get());
    out.append(digits, end.ptr);
}

std::string IntegerText(const MetaObject* value) {
    std::string text;
    AppendInteger(text, value);
    return text;
}

// ---------------------------------------------------------------- JSON

void AppendJson(std::string& out, const MetaObject* value) {
    if (!value) {
        out += "null";
        return;
    }
    switch (value->GetType()) {
        case MetaObj::META_STRING:
            AppendJsonString(out, static_cast<const MetaString*>(value)->Get());
            break;
        case MetaObj::META_INT:
            AppendInteger(out, value);
            break;
        case MetaObj::META_BOOL:
            out += static_cast<const MetaBool*>(value)->Get() ? "true" : "false";
            break;
        case MetaObj::META_STRUCT: {
            out += '{';
            bool first = true;
            for (const auto& [name, field] : static_cast<const MetaStruct*>(value)->GetFields()) {
                if (!first) out += ',';
                first = false;
                AppendJsonString(out, name);
                out += ':';
                AppendJson(out, field.get());
            }
            out += '}';
            break;
        }
        case MetaObj::META_LIST: {
            out += '[';
            bool first = true;
            for (const auto& item : static_cast<const MetaList*>(value)->GetItems()) {
                if (!first) out += ',';
                first = false;
                AppendJson(out, item.get());
            }
            out += ']';
            break;
        }
    }
}

std::size_t DisplayWidth(std::string_view text);

// Text of printable ASCII only, which a terminal shows as it is.
bool PlainAscii(std::string_view text) {
    for (unsigned char c : text) {
        if (c < 0x20 || c >= 0x7f) return false;
    }
    return true;
}

// ---------------------------------------------------------------- shared by simple and table

// Display rules of one rendering: which fields of a record, its heading, the units.
class Layout {
public:
    // raw: text is kept as it is (the formatter escapes it its own way) rather than made safe
    // for a terminal.
    Layout(const OutputParameters& parameters, bool table, bool raw = false)
        : parameters_(parameters), table_(table), raw_(raw) {}

    // The fields of record to show, in order. A named field the record lacks is skipped.
    std::vector<const MetaStruct::Field*> ShownFields(const MetaStruct& record) const {
        const Rules& rules = RulesFor(record.GetName());
        const std::optional<std::string>& list = rules.list;
        const bool generic = rules.generic;
        std::vector<const MetaStruct::Field*> shown;
        const auto& fields = record.GetFields();
        if (!list) {
            for (const auto& field : fields)
                shown.push_back(&field);
            return shown;
        }
        std::size_t start = 0;
        while (start <= list->size()) {
            std::size_t comma = list->find(',', start);
            if (comma == std::string::npos) comma = list->size();
            std::string wanted = list->substr(start, comma - start);
            for (const auto& field : fields) {
                if (field.first == wanted && std::find(shown.begin(), shown.end(), &field) == shown.end()) {
                    shown.push_back(&field);
                    break;
                }
            }
            start = comma + 1;
        }
        if (generic && shown.empty()) {
            for (const auto& field : fields)
                shown.push_back(&field);
        }
        return shown;
    }

    // The heading of a record in a list, or nothing.
    std::optional<std::string> Heading(const MetaStruct& record) const {
        const auto header = RulesFor(record.GetName()).header;  // a copy: Scalar below may look up others
        if (!header || *header == "<NONE>") return std::nullopt;
        std::string text;
        std::size_t pos = 0;
        while (pos < header->size()) {
            std::size_t open = header->find('%', pos);
            if (open == std::string::npos) {
                text.append(*header, pos, std::string::npos);
                break;
            }
            std::size_t close = header->find('%', open + 1);
            if (close == std::string::npos) {
                text.append(*header, pos, std::string::npos);
                break;
            }
            text.append(*header, pos, open - pos);
            auto value = record.GetField(header->substr(open + 1, close - open - 1));
            if (!value) return std::nullopt;  // names a field the record lacks: no heading
            text += Scalar(value.get(), record.GetName(), "");
            pos = close + 1;
        }
        return text;
    }

    // The text of a value inside a record: scalars, lists of strings joined by ", ", records
    // inline. With a field name, its unit is appended.
    std::string Scalar(const MetaObject* value, const std::string& record, const std::string& field) const {
        return field.empty() ? Plain(value) : Cell(value, Unit(record, field));
    }
    // The unit of a record's field, if the output parameters give one.
    std::optional<std::string> Unit(const std::string& record, const std::string& field) const {
        const Rules& rules = RulesFor(record);
        for (const auto& [name, unit] : rules.units) {
            if (name == field) return unit;
        }
        auto unit = parameters_.Get("units:" + record + "." + field);
        rules_.units.emplace_back(field, unit);  // rules_ is what RulesFor gave
        return unit;
    }
    // The text of a value with its unit (looked up once per column by the caller).
    std::string Cell(const MetaObject* value, const std::optional<std::string>& unit) const {
        std::string text = Plain(value);
        if (unit) {
            text += ' ';
            text += *unit;
        }
        return text;
    }
    // The same, appended to out; returns its display width. Strings and numbers, most of a
    // long table, are written straight in.
    std::size_t AppendCell(std::string& out, const MetaObject* value,
                           const std::optional<std::string>& unit) const {
        const std::size_t start = out.size();
        bool plain = false;
        if (value->GetType() == MetaObj::META_STRING) {
            const std::string& text = static_cast<const MetaString*>(value)->Get();
            plain = PlainAscii(text);
            if (plain || raw_) {
                out += text;
            } else {
                out += Display(text);
            }
        } else if (value->GetType() == MetaObj::META_INT) {
            AppendInteger(out, value);
            plain = true;
        } else {
            out += Plain(value);
        }
        if (unit) {
            out += ' ';
            out += *unit;
            plain = plain && PlainAscii(*unit);
        }
        const std::string_view cell = std::string_view(out).substr(start);
        return plain ? cell.size() : DisplayWidth(cell);
    }

    std::string Plain(const MetaObject* value) const {
        if (!value) return {};
        switch (value->GetType()) {
            case MetaObj::META_STRING:
                return raw_ ? static_cast<const MetaString*>(value)->Get()
                            : Display(static_cast<const MetaString*>(value)->Get());
            case MetaObj::META_INT:
                return IntegerText(value);
            case MetaObj::META_BOOL:
                return static_cast<const MetaBool*>(value)->Get() ? "true" : "false";
            case MetaObj::META_LIST: {
                const auto* list = static_cast<const MetaList*>(value);
                std::string text;
                const char* separator = list->GetElementType() == MetaObj::META_STRUCT ? "; " : ", ";
                bool first = true;
                for (const auto& item : list->GetItems()) {
                    if (!first) text += separator;
                    first = false;
                    text += Plain(item.get());
                }
                return text;
            }
            case MetaObj::META_STRUCT: {
                const auto* record = static_cast<const MetaStruct*>(value);
                std::string text;
                bool first = true;
                for (const auto* field : ShownFields(*record)) {
                    if (!first) text += ", ";
                    first = false;
                    text += field->first + ": " +
                            (raw_ ? Plain(field->second.get())
                                  : Scalar(field->second.get(), record->GetName(), field->first));
                }
                return text;
            }
        }
        return {};
    }

    // Text from the host as it is shown on a terminal.
    static std::string Display(const std::string& text) { return TerminalSafe(text); }

    const OutputParameters& parameters() const { return parameters_; }

private:
    // What the output parameters say about one kind of record, looked up once for the records
    // of a list (they share their name) rather than for each.
    struct Rules {
        std::string record;
        bool known = false;
        std::optional<std::string> list;  // the fields to show
        bool generic = false;             // the list came from the unqualified "table-columns"
        std::optional<std::string> header;
        std::vector<std::pair<std::string, std::optional<std::string>>> units;  // by field, as asked
    };
    const Rules& RulesFor(const std::string& name) const {
        if (rules_.known && rules_.record == name) return rules_;
        rules_ = Rules{};
        rules_.record = name;
        rules_.known = true;
        // "table-columns" names no record: it serves the records whose fields it names, and
        // leaves others (records nested in them) to show every field.
        auto& list = rules_.list;
        if (table_) {
            list = parameters_.Get("table-columns:" + name);
            if (!list) rules_.generic = static_cast<bool>(list = parameters_.Get("table-columns"));
            if (!list) list = parameters_.Get("fields:" + name);
        } else {
            list = parameters_.Get("fields:" + name);
            if (!list) list = parameters_.Get("table-columns:" + name);
            if (!list) rules_.generic = static_cast<bool>(list = parameters_.Get("table-columns"));
        }
        rules_.header = parameters_.Get("header:" + name);
        return rules_;
    }

    const OutputParameters& parameters_;
    bool table_;
    bool raw_;
    mutable Rules rules_;
};

// "show-header" (checked and made "true" or "false" when the user gave it).
bool ShowHeader(const OutputParameters& parameters) {
    return parameters.Get("show-header").value_or("true") != "false";
}

bool IsRecordList(const MetaObject* value) {
    return value && value->GetType() == MetaObj::META_LIST &&
           static_cast<const MetaList*>(value)->GetElementType() == MetaObj::META_STRUCT;
}

// ---------------------------------------------------------------- simple

class SimpleWriter {
public:
    SimpleWriter(const OutputParameters& parameters, std::string& out)
        : layout_(parameters, false), out_(out) {}

    void Root(const MetaObject& root) {
        switch (root.GetType()) {
            case MetaObj::META_BOOL:
                if (!static_cast<const MetaBool&>(root).Get()) out_ += "false\n";
                return;
            case MetaObj::META_STRING:
            case MetaObj::META_INT:
                out_ += layout_.Plain(&root);
                out_ += '\n';
                return;
            case MetaObj::META_STRUCT:
                Record(static_cast<const MetaStruct&>(root), 0);
                return;
            case MetaObj::META_LIST: {
                const auto& list = static_cast<const MetaList&>(root);
                if (list.GetElementType() == MetaObj::META_STRUCT) {
                    Records(list, 0);
                } else {
                    for (const auto& item : list.GetItems()) {
                        out_ += layout_.Plain(item.get());
                        out_ += '\n';
                    }
                }
                return;
            }
        }
    }

private:
    void Indent(std::size_t indent) { out_.append(indent, ' '); }

    void Record(const MetaStruct& record, std::size_t indent) {
        for (const auto* field : layout_.ShownFields(record)) {
            const MetaObject* value = field->second.get();
            Indent(indent);
            out_ += field->first;
            out_ += ':';
            if (value && value->GetType() == MetaObj::META_STRUCT) {
                out_ += '\n';
                Record(static_cast<const MetaStruct&>(*value), indent + 3);
            } else if (IsRecordList(value)) {
                out_ += '\n';
                Records(static_cast<const MetaList&>(*value), indent + 3);
            } else {
                out_ += ' ';
                out_ += layout_.Scalar(value, record.GetName(), field->first);
                out_ += '\n';
            }
        }
    }

    void Records(const MetaList& list, std::size_t indent) {
        bool first = true;
        for (const auto& item : list.GetItems()) {
            if (!item || item->GetType() != MetaObj::META_STRUCT) continue;
            const auto& record = static_cast<const MetaStruct&>(*item);
            if (!first) out_ += '\n';
            first = false;
            if (auto heading = layout_.Heading(record)) {
                Indent(indent);
                out_ += *heading;
                out_ += '\n';
                Record(record, indent + 3);
            } else {
                Record(record, indent);
            }
        }
    }

    Layout layout_;
    std::string& out_;
};

// ---------------------------------------------------------------- table

std::size_t DisplayWidth(std::string_view text) {
    // Counts code points, not bytes, so that UTF-8 text lines up.
    std::size_t width = 0;
    for (unsigned char c : text) {
        if ((c & 0xC0) != 0x80) ++width;
    }
    return width;
}

int TerminalColumns(const OutputParameters& parameters) {
    if (parameters.columns > 0) return parameters.columns;
    if (const char* env = std::getenv("COLUMNS")) {
        char* end = nullptr;
        long value = std::strtol(env, &end, 10);
        if (end != env && *end == '\0' && value > 0 && value < 100000) return static_cast<int>(value);
    }
    return 80;
}

class TableWriter {
public:
    TableWriter(const OutputParameters& parameters, std::string& out)
        : layout_(parameters, true), out_(out) {}

    void Root(const MetaObject& root) {
        if (root.GetType() == MetaObj::META_STRUCT) {
            std::vector<const MetaStruct*> records{static_cast<const MetaStruct*>(&root)};
            Table(records);
            return;
        }
        if (IsRecordList(&root)) {
            std::vector<const MetaStruct*> records;
            for (const auto& item : static_cast<const MetaList&>(root).GetItems()) {
                if (item && item->GetType() == MetaObj::META_STRUCT) {
                    records.push_back(static_cast<const MetaStruct*>(item.get()));
                }
            }
            Table(records);
            return;
        }
        SimpleWriter(layout_.parameters(), out_).Root(root);
    }

private:
    void Table(const std::vector<const MetaStruct*>& records) {
        if (records.empty()) return;
        // The columns are those of the first record; a later record's cell is looked up by name
        // (first where the first record has it: records of a list have the same fields).
        std::vector<std::string> columns;
        std::vector<std::size_t> places;
        const auto& firstFields = records.front()->GetFields();
        for (const auto* field : layout_.ShownFields(*records.front())) {
            columns.push_back(field->first);
            places.push_back(static_cast<std::size_t>(field - firstFields.data()));
        }
        if (columns.empty()) return;
        const std::string& recordName = records.front()->GetName();
        std::vector<std::optional<std::string>> units;
        for (const auto& column : columns)
            units.push_back(layout_.Unit(recordName, column));

        const std::size_t count = columns.size();
        // The cells row by row: their text one after another in one string (a cell ends where
        // the next begins), their display widths.
        std::string cellText;
        std::vector<std::size_t> cellEnds;
        std::vector<std::size_t> cellWidths;
        cellEnds.reserve(records.size() * count);
        cellWidths.reserve(records.size() * count);
        const bool header = ShowHeader(layout_.parameters());
        std::vector<std::size_t> widths(count);
        for (std::size_t i = 0; i < count; ++i)
            widths[i] = header ? DisplayWidth(columns[i]) : 0;
        for (const auto* record : records) {
            const auto& fields = record->GetFields();
            for (std::size_t i = 0; i < count; ++i) {
                const MetaObject* value = nullptr;
                if (places[i] < fields.size() && fields[places[i]].first == columns[i]) {
                    value = fields[places[i]].second.get();
                } else {
                    for (const auto& field : fields) {
                        if (field.first == columns[i]) {
                            value = field.second.get();
                            break;
                        }
                    }
                }
                cellWidths.push_back(value ? layout_.AppendCell(cellText, value, units[i]) : 0);
                cellEnds.push_back(cellText.size());
                widths[i] = std::max(widths[i], cellWidths.back());
            }
        }

        bool wrapLast = layout_.parameters().Get("wrap-last").value_or("") == "true";
        std::size_t lastStart = 0;
        for (std::size_t i = 0; i + 1 < columns.size(); ++i)
            lastStart += widths[i] + 2;
        std::size_t lastWidth = widths.back();
        if (wrapLast) {
            std::size_t total = static_cast<std::size_t>(TerminalColumns(layout_.parameters()));
            std::size_t room = total > lastStart ? total - lastStart : 0;
            room = std::max<std::size_t>(room, 10);
            lastWidth = std::min(lastWidth, room);
            if (header) lastWidth = std::max(lastWidth, DisplayWidth(columns.back()));
        }

        std::vector<std::string> dashes;
        std::vector<std::size_t> dashWidths;
        for (std::size_t i = 0; i < count; ++i) {
            dashes.emplace_back(i + 1 == count ? lastWidth : widths[i], '-');
            dashWidths.push_back(dashes.back().size());
        }
        if (header) {
            std::vector<std::size_t> headWidths;
            for (const auto& column : columns)
                headWidths.push_back(DisplayWidth(column));
            const std::vector<std::string_view> heads(columns.begin(), columns.end());
            const std::vector<std::string_view> rules(dashes.begin(), dashes.end());
            Row(heads.data(), headWidths.data(), count, widths, lastStart, lastWidth, false);
            Row(rules.data(), dashWidths.data(), count, widths, lastStart, lastWidth, false);
        }
        // Room for every line at its widest (wrapped lines may still need more).
        out_.reserve(out_.size() + (records.size() + 2) * (lastStart + lastWidth + 1));
        std::vector<std::string_view> row(count);
        for (std::size_t at = 0; at < cellEnds.size(); at += count) {
            for (std::size_t i = 0; i < count; ++i) {
                const std::size_t start = at + i == 0 ? 0 : cellEnds[at + i - 1];
                row[i] = std::string_view(cellText).substr(start, cellEnds[at + i] - start);
            }
            Row(row.data(), &cellWidths[at], count, widths, lastStart, lastWidth, wrapLast);
        }
    }

    // One row of count cells with their display widths.
    void Row(const std::string_view* cells, const std::size_t* cellWidths, std::size_t count,
             const std::vector<std::size_t>& widths, std::size_t lastStart, std::size_t lastWidth,
             bool wrap) {
        const std::size_t lineStart = out_.size();
        for (std::size_t i = 0; i + 1 < count; ++i) {
            out_ += cells[i];
            out_.append(widths[i] - cellWidths[i] + 2, ' ');
        }
        const std::string_view last = cells[count - 1];
        if (!wrap || cellWidths[count - 1] <= lastWidth) {
            out_ += last;
            TrimLine(lineStart);
            return;
        }
        const auto pieces = WrapText(std::string(last), lastWidth);
        for (std::size_t i = 0; i < pieces.size(); ++i) {
            const std::size_t start = out_.size();
            if (i > 0) out_.append(lastStart, ' ');
            out_ += pieces[i];
            TrimLine(i == 0 ? lineStart : start);
        }
    }

    // Ends the line begun at start, without the blanks at its end.
    void TrimLine(std::size_t start) {
        while (out_.size() > start && out_.back() == ' ')
            out_.pop_back();
        out_ += '\n';
    }

    Layout layout_;
    std::string& out_;
};

// ---------------------------------------------------------------- the user's "fields"

std::vector<std::string> SplitList(const std::string& list) {
    std::vector<std::string> names;
    std::size_t start = 0;
    while (start <= list.size()) {
        std::size_t comma = list.find(',', start);
        if (comma == std::string::npos) comma = list.size();
        names.push_back(list.substr(start, comma - start));
        start = comma + 1;
    }
    return names;
}

// The fields of a record the machine formats (json, xml, keyvalue) show: the chosen ones in
// their order, else every field.
std::vector<const MetaStruct::Field*> FieldsOf(const MetaStruct& record,
                                               const std::vector<std::string>* chosen) {
    std::vector<const MetaStruct::Field*> shown;
    const auto& fields = record.GetFields();
    if (!chosen) {
        for (const auto& field : fields)
            shown.push_back(&field);
        return shown;
    }
    for (const auto& name : *chosen) {
        for (const auto& field : fields) {
            if (field.first == name) {
                shown.push_back(&field);
                break;
            }
        }
    }
    return shown;
}

// The record a result is made of: the root record, or the records of a root list (the first
// one, else the list's prototype).
const MetaStruct* ResultRecord(const MetaObject* root) {
    if (!root) return nullptr;
    if (root->GetType() == MetaObj::META_STRUCT) return static_cast<const MetaStruct*>(root);
    if (!IsRecordList(root)) return nullptr;
    const auto* list = static_cast<const MetaList*>(root);
    for (const auto& item : list->GetItems()) {
        if (item && item->GetType() == MetaObj::META_STRUCT)
            return static_cast<const MetaStruct*>(item.get());
    }
    return list->GetPrototype().get();
}

// JSON of the result with the chosen fields of its own records.
void AppendJsonResult(std::string& out, const MetaObject& root, const std::vector<std::string>* chosen) {
    auto record = [&](const MetaStruct& value) {
        out += '{';
        bool first = true;
        for (const auto* field : FieldsOf(value, chosen)) {
            if (!first) out += ',';
            first = false;
            AppendJsonString(out, field->first);
            out += ':';
            AppendJson(out, field->second.get());
        }
        out += '}';
    };
    if (chosen && root.GetType() == MetaObj::META_STRUCT) {
        record(static_cast<const MetaStruct&>(root));
    } else if (chosen && IsRecordList(&root)) {
        out += '[';
        bool first = true;
        for (const auto& item : static_cast<const MetaList&>(root).GetItems()) {
            if (!first) out += ',';
            first = false;
            if (item && item->GetType() == MetaObj::META_STRUCT) {
                record(static_cast<const MetaStruct&>(*item));
            } else {
                AppendJson(out, item.get());
            }
        }
        out += ']';
    } else {
        AppendJson(out, &root);
    }
    out += '\n';
}

// ---------------------------------------------------------------- xml

// Text as XML character data or attribute value. Markup characters become entities; tab,
// line feed and carriage return character references (so that they survive attribute
// normalisation); DEL and the C1 controls references too, so that the raw byte never reaches
// a terminal. The other C0 controls, U+FFFE, U+FFFF and bytes that are not UTF-8 cannot stand
// in an XML 1.0 document in any form: each becomes U+FFFD.
void AppendXmlText(std::string& out, const std::string& text) {
    static const char hex[] = "0123456789ABCDEF";
    static const char replacement[] = "\xEF\xBF\xBD";
    const auto* bytes = reinterpret_cast<const unsigned char*>(text.data());
    std::size_t i = 0;
    while (i < text.size()) {
        // Printable ASCII that needs no escape goes in runs.
        std::size_t run = i;
        while (run < text.size() && bytes[run] >= 0x20 && bytes[run] < 0x7f && bytes[run] != '&' &&
               bytes[run] != '<' && bytes[run] != '>' && bytes[run] != '"' && bytes[run] != '\'')
            ++run;
        if (run > i) {
            out.append(text, i, run - i);
            i = run;
            continue;
        }
        unsigned char c = bytes[i];
        if (c < 0x80) {
            switch (c) {
                case '&':
                    out += "&amp;";
                    break;
                case '<':
                    out += "&lt;";
                    break;
                case '>':
                    out += "&gt;";
                    break;
                case '"':
                    out += "&quot;";
                    break;
                case '\'':
                    out += "&apos;";
                    break;
                case '\t':
                    out += "&#9;";
                    break;
                case '\n':
                    out += "&#10;";
                    break;
                case '\r':
                    out += "&#13;";
                    break;
                default:
                    if (c == 0x7f) {
                        out += "&#x7F;";
                    } else if (c < 0x20) {
                        out += replacement;
                    } else {
                        out += static_cast<char>(c);
                    }
            }
            ++i;
            continue;
        }
        std::size_t length = Utf8SequenceLength(bytes + i, text.size() - i);
        if (length == 0) {
            out += replacement;
            ++i;
            continue;
        }
        if (length == 2 && c == 0xC2 && bytes[i + 1] <= 0x9F) {
            out += "&#x";
            out += hex[bytes[i + 1] >> 4];
            out += hex[bytes[i + 1] & 0xf];
            out += ';';
        } else if (length == 3 && c == 0xEF && bytes[i + 1] == 0xBF && bytes[i + 2] >= 0xBE) {
            out += replacement;
        } else {
            out.append(text, i, length);
        }
        i += length;
    }
}

class XmlWriter {
public:
    XmlWriter(const std::vector<std::string>* chosen, std::string& out) : chosen_(chosen), out_(out) {}

    void Root(const MetaObject& root) {
        out_ += "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<output>\n";
        Value(&root, 1, true);
        out_ += "</output>\n";
    }

private:
    void Indent(std::size_t level) { out_.append(2 * level, ' '); }

    // A scalar on one line: <string>text</string>.
    static bool Inline(const MetaObject* value) {
        return !value || (value->GetType() != MetaObj::META_STRUCT && value->GetType() != MetaObj::META_LIST);
    }

    void Scalar(const MetaObject* value) {
        if (!value) {
            out_ += "<none/>";
            return;
        }
        switch (value->GetType()) {
            case MetaObj::META_STRING:
                out_ += "<string>";
                AppendXmlText(out_, static_cast<const MetaString*>(value)->Get());
                out_ += "</string>";
                break;
            case MetaObj::META_INT:
                out_ += "<integer>";
                AppendInteger(out_, value);
                out_ += "</integer>";
                break;
            case MetaObj::META_BOOL:
                out_ += static_cast<const MetaBool*>(value)->Get() ? "<boolean>true</boolean>"
                                                                   : "<boolean>false</boolean>";
                break;
            default:
                break;
        }
    }

    // A value on lines of its own at the given level. top: the result itself, whose records
    // show the chosen fields.
    void Value(const MetaObject* value, std::size_t level, bool top) {
        Indent(level);
        if (Inline(value)) {
            Scalar(value);
            out_ += '\n';
            return;
        }
        if (value->GetType() == MetaObj::META_LIST) {
            const auto& items = static_cast<const MetaList*>(value)->GetItems();
            if (items.empty()) {
                out_ += "<list/>\n";
                return;
            }
            out_ += "<list>\n";
            for (const auto& item : items)
                Value(item.get(), level + 1, top);
            Indent(level);
            out_ += "</list>\n";
            return;
        }
        const auto& record = static_cast<const MetaStruct&>(*value);
        out_ += "<record name=\"";
        AppendXmlText(out_, record.GetName());
        out_ += "\">\n";
        for (const auto* field : FieldsOf(record, top ? chosen_ : nullptr)) {
            Indent(level + 1);
            out_ += "<field name=\"";
            AppendXmlText(out_, field->first);
            out_ += "\">";
            if (Inline(field->second.get())) {
                Scalar(field->second.get());
            } else {
                out_ += '\n';
                Value(field->second.get(), level + 2, false);
                Indent(level + 1);
            }
            out_ += "</field>\n";
        }
        Indent(level);
        out_ += "</record>\n";
    }

    const std::vector<std::string>* chosen_;
    std::string& out_;
};

// ---------------------------------------------------------------- csv

// One CSV field: quoted when it holds a comma, a quote, a line break or a leading or trailing
// blank, quotes doubled. Control characters other than tab and line breaks, and bytes that
// are not UTF-8, become U+FFFD: CSV has no escapes, and the raw bytes could drive a terminal.
void AppendCsvField(std::string& out, const std::string& text) {
    std::string clean;
    clean.reserve(text.size());
    const auto* bytes = reinterpret_cast<const unsigned char*>(text.data());
    std::size_t i = 0;
    while (i < text.size()) {
        // Printable ASCII that needs no escape goes in runs.
        std::size_t run = i;
        while (run < text.size() && bytes[run] >= 0x20 && bytes[run] < 0x7f)
            ++run;
        if (run > i) {
            clean.append(text, i, run - i);
            i = run;
            continue;
        }
        unsigned char c = bytes[i];
        if (c < 0x80) {
            if ((c < 0x20 && c != '\t' && c != '\n' && c != '\r') || c == 0x7f) {
                clean += "\xEF\xBF\xBD";
            } else {
                clean += static_cast<char>(c);
            }
            ++i;
            continue;
        }
        std::size_t length = Utf8SequenceLength(bytes + i, text.size() - i);
        if (length == 0 || (length == 2 && c == 0xC2 && bytes[i + 1] <= 0x9F)) {
            clean += "\xEF\xBF\xBD";
            i += length == 0 ? 1 : length;
            continue;
        }
        clean.append(text, i, length);
        i += length;
    }
    bool quote = clean.find_first_of(",\"\r\n") != std::string::npos ||
                 (!clean.empty() && (clean.front() == ' ' || clean.back() == ' '));
    if (!quote) {
        out += clean;
        return;
    }
    out += '"';
    for (char c : clean) {
        if (c == '"') out += '"';
        out += c;
    }
    out += '"';
}

class CsvWriter {
public:
    CsvWriter(const OutputParameters& parameters, std::string& out)
        : layout_(parameters, true, true), out_(out) {}

    void Root(const MetaObject& root) {
        if (root.GetType() == MetaObj::META_STRUCT) {
            Table({static_cast<const MetaStruct*>(&root)}, static_cast<const MetaStruct*>(&root));
            return;
        }
        if (IsRecordList(&root)) {
            std::vector<const MetaStruct*> records;
            for (const auto& item : static_cast<const MetaList&>(root).GetItems()) {
                if (item && item->GetType() == MetaObj::META_STRUCT)
                    records.push_back(static_cast<const MetaStruct*>(item.get()));
            }
            Table(records, ResultRecord(&root));
            return;
        }
        if (root.GetType() == MetaObj::META_LIST) {
            for (const auto& item : static_cast<const MetaList&>(root).GetItems())
                Line({layout_.Plain(item.get())});
            return;
        }
        Line({layout_.Plain(&root)});
    }

private:
    // The columns are those of the first record (of the prototype when the list is empty, so
    // that an empty result still has its header); a later record's cell is looked up by name.
    void Table(const std::vector<const MetaStruct*>& records, const MetaStruct* shape) {
        if (!shape) return;
        std::vector<std::string> columns;
        for (const auto* field : layout_.ShownFields(*shape))
            columns.push_back(field->first);
        if (columns.empty()) return;
        if (ShowHeader(layout_.parameters())) Line(columns);
        for (const auto* record : records) {
            std::vector<std::string> cells;
            for (const auto& column : columns) {
                auto value = record->GetField(column);
                cells.push_back(value ? layout_.Plain(value.get()) : std::string());
            }
            Line(cells);
        }
    }

    // One record, ended by CRLF.
    void Line(const std::vector<std::string>& cells) {
        for (std::size_t i = 0; i < cells.size(); ++i) {
            if (i) out_ += ',';
            AppendCsvField(out_, cells[i]);
        }
        out_ += "\r\n";
    }

    Layout layout_;
    std::string& out_;
};

// ---------------------------------------------------------------- keyvalue

// A value on a keyvalue line: backslash, line breaks, tab and every other control character
// or byte that is not UTF-8 written as escapes (\\, \n, \r, \t, \xNN), so that each value
// stays on its line and `printf '%b'` gives the exact bytes back.
void AppendKeyValueText(std::string& out, const std::string& text) {
    static const char hex[] = "0123456789abcdef";
    auto escape = [&](unsigned char c) {
        out += "\\x";
        out += hex[c >> 4];
        out += hex[c & 0xf];
    };
    const auto* bytes = reinterpret_cast<const unsigned char*>(text.data());
    std::size_t i = 0;
    while (i < text.size()) {
        // Printable ASCII that needs no escape goes in runs.
        std::size_t run = i;
        while (run < text.size() && bytes[run] >= 0x20 && bytes[run] < 0x7f && bytes[run] != '\\')
            ++run;
        if (run > i) {
            out.append(text, i, run - i);
            i = run;
            continue;
        }
        unsigned char c = bytes[i];
        if (c < 0x80) {
            switch (c) {
                case '\\':
                    out += "\\\\";
                    break;
                case '\n':
                    out += "\\n";
                    break;
                case '\r':
                    out += "\\r";
                    break;
                case '\t':
                    out += "\\t";
                    break;
                default:
                    if (c < 0x20 || c == 0x7f) {
                        escape(c);
                    } else {
                        out += static_cast<char>(c);
                    }
            }
            ++i;
            continue;
        }
        std::size_t length = Utf8SequenceLength(bytes + i, text.size() - i);
        if (length == 0) {
            escape(c);
            ++i;
        } else if (length == 2 && c == 0xC2 && bytes[i + 1] <= 0x9F) {
            escape(c);
            escape(bytes[i + 1]);
            i += 2;
        } else {
            out.append(text, i, length);
            i += length;
        }
    }
}

class KeyValueWriter {
public:
    KeyValueWriter(const std::vector<std::string>* chosen, std::string& out) : chosen_(chosen), out_(out) {}

    void Root(const MetaObject& root) {
        if (root.GetType() == MetaObj::META_STRUCT) {
            const auto& record = static_cast<const MetaStruct&>(root);
            Record(record, KeyText(record.GetName()), chosen_);
        } else if (root.GetType() == MetaObj::META_LIST) {
            // Records of a list are separated by a blank line.
            bool first = true;
            for (const auto& item : static_cast<const MetaList&>(root).GetItems()) {
                if (item && item->GetType() == MetaObj::META_STRUCT) {
                    if (!first) out_ += '\n';
                    first = false;
                    const auto& record = static_cast<const MetaStruct&>(*item);
                    Record(record, KeyText(record.GetName()), chosen_);
                } else {
                    Scalar(item.get());
                    out_ += '\n';
                }
            }
        } else {
            Scalar(&root);
            out_ += '\n';
        }
    }

private:
    // Names in keys are escaped too, and '=' in them as well: the first '=' ends the key.
    static std::string KeyText(const std::string& name) {
        std::string key;
        AppendKeyValueText(key, name);
        std::string out;
        for (char c : key) {
            if (c == '=') {
                out += "\\x3d";
            } else {
                out += c;
            }
        }
        return out;
    }

    void Scalar(const MetaObject* value) {
        if (!value) return;
        switch (value->GetType()) {
            case MetaObj::META_STRING:
                AppendKeyValueText(out_, static_cast<const MetaString*>(value)->Get());
                break;
            case MetaObj::META_INT:
                AppendInteger(out_, value);
                break;
            case MetaObj::META_BOOL:
                out_ += static_cast<const MetaBool*>(value)->Get() ? "true" : "false";
                break;
            default:
                break;
        }
    }

    // Every field as PREFIX.Field=value; nested records extend the prefix, and a list gives
    // one line (or one group of lines) per element.
    void Record(const MetaStruct& record, const std::string& prefix, const std::vector<std::string>* chosen) {
        for (const auto* field : FieldsOf(record, chosen))
            Field(field->second.get(), prefix + "." + KeyText(field->first));
    }

    void Field(const MetaObject* value, const std::string& key) {
        if (!value) return;
        if (value->GetType() == MetaObj::META_STRUCT) {
            Record(static_cast<const MetaStruct&>(*value), key, nullptr);
            return;
        }
        if (value->GetType() == MetaObj::META_LIST) {
            for (const auto& item : static_cast<const MetaList*>(value)->GetItems())
                Field(item.get(), key);
            return;
        }
        out_ += key;
        out_ += '=';
        Scalar(value);
        out_ += '\n';
    }

    const std::vector<std::string>* chosen_;
    std::string& out_;
};

bool ParseBoolean(std::string text, bool& value) {
    for (char& c : text)
        c = static_cast<char>(std::tolower(static_cast<unsigned char>(c)));
    if (text == "true" || text == "yes" || text == "on" || text == "1") {
        value = true;
        return true;
    }
    if (text == "false" || text == "no" || text == "off" || text == "0") {
        value = false;
        return true;
    }
    return false;
}

}  // namespace

void AppendJsonString(std::string& out, const std::string& text) {
    static const char hex[] = "0123456789abcdef";
    out += '"';
    const auto* bytes = reinterpret_cast<const unsigned char*>(text.data());
    std::size_t size = text.size();
    std::size_t i = 0;
    while (i < size) {
        // Printable ASCII that needs no escape goes in runs.
        std::size_t run = i;
        while (run < size && bytes[run] >= 0x20 && bytes[run] < 0x7f && bytes[run] != '"' &&
               bytes[run] != '\\')
            ++run;
        if (run > i) {
            out.append(text, i, run - i);
            i = run;
            continue;
        }
        unsigned char c = bytes[i];
        if (c < 0x80) {
            switch (c) {
                case '"':
                    out += "\\\"";
                    break;
                case '\\':
                    out += "\\\\";
                    break;
                case '\n':
                    out += "\\n";
                    break;
                case '\r':
                    out += "\\r";
                    break;
                case '\t':
                    out += "\\t";
                    break;
                case '\b':
                    out += "\\b";
                    break;
                case '\f':
                    out += "\\f";
                    break;
                default:
                    if (c < 0x20 || c == 0x7f) {
                        out += "\\u00";
                        out += hex[c >> 4];
                        out += hex[c & 0xf];
                    } else {
                        out += static_cast<char>(c);
                    }
            }
            ++i;
            continue;
        }
        // A UTF-8 sequence: copy it when it is well formed, else one replacement per byte.
        std::size_t length = Utf8SequenceLength(bytes + i, size - i);
        if (length == 0) {
            out += "\\ufffd";
            ++i;
        } else if (length == 2 && c == 0xC2 && bytes[i + 1] <= 0x9F) {
            // C1 control characters are escaped like the C0 ones.
            out += "\\u00";
            out += hex[bytes[i + 1] >> 4];
            out += hex[bytes[i + 1] & 0xf];
            i += 2;
        } else {
            out.append(text, i, length);
            i += length;
        }
    }
    out += '"';
}

std::string TerminalSafe(const std::string& text) {
    static const char hex[] = "0123456789abcdef";
    auto escape = [](std::string& out, unsigned int value, bool unicode) {
        out += unicode ? "\\u00" : "\\x";
        out += hex[(value >> 4) & 0xf];
        out += hex[value & 0xf];
    };
    // Most values need nothing: keep them as they are.
    bool plain = true;
    for (unsigned char c : text) {
        if (c < 0x20 || c >= 0x7f) {
            plain = false;
            break;
        }
    }
    if (plain) return text;

    std::string out;
    out.reserve(text.size() + 8);
    const auto* bytes = reinterpret_cast<const unsigned char*>(text.data());
    std::size_t i = 0;
    while (i < text.size()) {
        unsigned char c = bytes[i];
        if (c < 0x80) {
            switch (c) {
                case '\t':
                    out += "\\t";
                    break;
                case '\n':
                    out += "\\n";
                    break;
                case '\r':
                    out += "\\r";
                    break;
                default:
                    if (c < 0x20 || c == 0x7f) {
                        escape(out, c, false);
                    } else {
                        out += static_cast<char>(c);
                    }
            }
            ++i;
            continue;
        }
        std::size_t length = Utf8SequenceLength(bytes + i, text.size() - i);
        if (length == 0) {
            escape(out, c, false);  // not UTF-8: a lone byte could act as a control code
            ++i;
            continue;
        }
        if (length == 2 && c == 0xC2 && bytes[i + 1] <= 0x9F) {
            escape(out, bytes[i + 1], true);  // C1 control character
        } else {
            out.append(text, i, length);
        }
        i += length;
    }
    return out;
}

std::string TerminalSafeLines(const std::string& text) {
    std::string out;
    std::size_t start = 0;
    while (true) {
        std::size_t end = text.find('\n', start);
        out += TerminalSafe(text.substr(start, end == std::string::npos ? std::string::npos : end - start));
        if (end == std::string::npos) break;
        out += '\n';
        start = end + 1;
    }
    return out;
}

std::string CheckFormatParameter(const std::string& key, std::string& value) {
    static const char* const bare[] = {"fields", "show-header", "table-columns", "wrap-last"};
    static const char* const prefixed[] = {"fields:", "header:", "units:", "table-columns:"};
    bool known = std::find_if(std::begin(bare), std::end(bare), [&](const char* k) { return key == k; }) !=
                 std::end(bare);
    for (const char* prefix : prefixed) {
        std::size_t length = std::char_traits<char>::length(prefix);
        if (key.size() > length && key.compare(0, length, prefix) == 0) known = true;
    }
    if (!known) {
        return "unknown display parameter '" + TerminalSafe(key) +
               "' for --format-param (choose from fields, show-header, table-columns, wrap-last, "
               "fields:RECORD, header:RECORD, units:RECORD.FIELD, table-columns:RECORD)";
    }
    if (key == "show-header" || key == "wrap-last") {
        bool flag = false;
        if (!ParseBoolean(value, flag))
            return "--format-param " + key + ": '" + TerminalSafe(value) +
                   "' is not a boolean (true or false)";
        value = flag ? "true" : "false";
    }
    if (key == "fields") {
        for (const auto& name : SplitList(value)) {
            if (name.empty())
                return "--format-param fields: an empty field name in '" + TerminalSafe(value) + "'";
        }
    }
    return {};
}

std::string CheckFields(const OutputParameters& parameters, const MetaObj::MetaObject* shape) {
    auto list = parameters.Get("fields");
    if (!list || !shape) return {};
    const MetaStruct* record = ResultRecord(shape);
    if (!record) return "--format-param fields: this command's result has no fields";
    for (const auto& name : SplitList(*list)) {
        if (!record->GetField(name)) {
            std::string error = "--format-param fields: '" + TerminalSafe(name) + "' is not a field of " +
                                record->GetName() + " (fields: ";
            bool first = true;
            for (const auto& field : record->GetFields()) {
                error += (first ? "" : ", ") + field.first;
                first = false;
            }
            return error + ")";
        }
    }
    return {};
}

void Render(const std::string& formatter, const MetaObj::MetaObject& root, const OutputParameters& parameters,
            std::string& out) {
    // The user's "fields" chooses the fields of the result's own records, before anything the
    // command set for them.
    OutputParameters effective = parameters;
    std::vector<std::string> chosenFields;
    const std::vector<std::string>* chosen = nullptr;
    if (auto fields = parameters.Get("fields")) {
        chosenFields = SplitList(*fields);
        chosen = &chosenFields;
        if (const MetaStruct* record = ResultRecord(&root)) {
            effective.Set("fields:" + record->GetName(), *fields);
            effective.Set("table-columns:" + record->GetName(), *fields);
        }
    }
    if (formatter == "json") {
        AppendJsonResult(out, root, chosen);
    } else if (formatter == "table") {
        TableWriter(effective, out).Root(root);
    } else if (formatter == "xml") {
        XmlWriter(chosen, out).Root(root);
    } else if (formatter == "csv") {
        CsvWriter(effective, out).Root(root);
    } else if (formatter == "keyvalue") {
        KeyValueWriter(chosen, out).Root(root);
    } else {
        SimpleWriter(effective, out).Root(root);
    }
}

}  // namespace Zorbel::Format
