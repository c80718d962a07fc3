#include "zorbel/formatter.h"

#include <algorithm>
#include <cstdlib>
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
    static const std::vector<std::string> names{"simple", "table", "json"};
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
            out += std::to_string(static_cast<const MetaInt*>(value)->Get());
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

// ---------------------------------------------------------------- shared by simple and table

// Display rules of one rendering: which fields of a record, its heading, the units.
class Layout {
public:
    Layout(const OutputParameters& parameters, bool table) : parameters_(parameters), table_(table) {}

    // The fields of record to show, in order. A named field the record lacks is skipped.
    std::vector<const MetaStruct::Field*> ShownFields(const MetaStruct& record) const {
        std::optional<std::string> list;
        const std::string& name = record.GetName();
        // "table-columns" names no record: it serves the records whose fields it names, and
        // leaves others (records nested in them) to show every field.
        bool generic = false;
        if (table_) {
            list = parameters_.Get("table-columns:" + name);
            if (!list) generic = static_cast<bool>(list = parameters_.Get("table-columns"));
            if (!list) list = parameters_.Get("fields:" + name);
        } else {
            list = parameters_.Get("fields:" + name);
            if (!list) list = parameters_.Get("table-columns:" + name);
            if (!list) generic = static_cast<bool>(list = parameters_.Get("table-columns"));
        }
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
        auto header = parameters_.Get("header:" + record.GetName());
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
        std::string text = Plain(value);
        if (!field.empty()) {
            if (auto unit = parameters_.Get("units:" + record + "." + field)) {
                text += ' ';
                text += *unit;
            }
        }
        return text;
    }

    std::string Plain(const MetaObject* value) const {
        if (!value) return {};
        switch (value->GetType()) {
            case MetaObj::META_STRING:
                return Display(static_cast<const MetaString*>(value)->Get());
            case MetaObj::META_INT:
                return std::to_string(static_cast<const MetaInt*>(value)->Get());
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
                    text +=
                        field->first + ": " + Scalar(field->second.get(), record->GetName(), field->first);
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
    const OutputParameters& parameters_;
    bool table_;
};

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

std::size_t DisplayWidth(const std::string& text) {
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
        // The columns are those of the first record; a later record's cell is looked up by name.
        std::vector<std::string> columns;
        for (const auto* field : layout_.ShownFields(*records.front()))
            columns.push_back(field->first);
        if (columns.empty()) return;
        const std::string& recordName = records.front()->GetName();

        std::vector<std::vector<std::string>> rows;
        rows.reserve(records.size());
        for (const auto* record : records) {
            std::vector<std::string> row;
            row.reserve(columns.size());
            for (const auto& column : columns) {
                auto value = record->GetField(column);
                row.push_back(value ? layout_.Scalar(value.get(), recordName, column) : std::string());
            }
            rows.push_back(std::move(row));
        }

        std::vector<std::size_t> widths(columns.size());
        for (std::size_t i = 0; i < columns.size(); ++i) {
            widths[i] = DisplayWidth(columns[i]);
            for (const auto& row : rows)
                widths[i] = std::max(widths[i], DisplayWidth(row[i]));
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
            lastWidth = std::max(lastWidth, DisplayWidth(columns.back()));
        }

        std::vector<std::string> dashes;
        for (std::size_t i = 0; i < columns.size(); ++i) {
            dashes.emplace_back(i + 1 == columns.size() ? lastWidth : widths[i], '-');
        }
        Row(columns, widths, lastStart, lastWidth, false);
        Row(dashes, widths, lastStart, lastWidth, false);
        for (const auto& row : rows)
            Row(row, widths, lastStart, lastWidth, wrapLast);
    }

    void Row(const std::vector<std::string>& cells, const std::vector<std::size_t>& widths,
             std::size_t lastStart, std::size_t lastWidth, bool wrap) {
        std::string line;
        for (std::size_t i = 0; i + 1 < cells.size(); ++i) {
            line += cells[i];
            line.append(widths[i] - DisplayWidth(cells[i]) + 2, ' ');
        }
        std::vector<std::string> last;
        if (wrap && DisplayWidth(cells.back()) > lastWidth) {
            last = WrapText(cells.back(), lastWidth);
        } else {
            last.push_back(cells.back());
        }
        for (std::size_t i = 0; i < last.size(); ++i) {
            std::string text = i == 0 ? line : std::string(lastStart, ' ');
            text += last[i];
            while (!text.empty() && text.back() == ' ')
                text.pop_back();
            out_ += text;
            out_ += '\n';
        }
    }

    Layout layout_;
    std::string& out_;
};

}  // namespace

void AppendJsonString(std::string& out, const std::string& text) {
    static const char hex[] = "0123456789abcdef";
    out += '"';
    const auto* bytes = reinterpret_cast<const unsigned char*>(text.data());
    std::size_t size = text.size();
    std::size_t i = 0;
    while (i < size) {
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
                case '\t': out += "\\t"; break;
                case '\n': out += "\\n"; break;
                case '\r': out += "\\r"; break;
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

void Render(const std::string& formatter, const MetaObj::MetaObject& root, const OutputParameters& parameters,
            std::string& out) {
    if (formatter == "json") {
        AppendJson(out, &root);
        out += '\n';
    } else if (formatter == "table") {
        TableWriter(parameters, out).Root(root);
    } else {
        SimpleWriter(parameters, out).Root(root);
    }
}

}  // namespace Zorbel::Format
