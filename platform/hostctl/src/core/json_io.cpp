#include "core/json_io.h"

#include <bit>
#include <charconv>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <deque>
#if defined(__SSE2__)
#include <emmintrin.h>
#endif

#include "core/text.h"

namespace TknCtl::Json {

namespace {

std::string Number(long double value) {
    char buffer[64];
    std::snprintf(buffer, sizeof(buffer), "%.0Lf", value);
    return buffer;
}

}  // namespace

std::string In::Path() const {
    if (!parent_) return name_ ? name_ : "";
    std::string path = parent_->Path();
    if (key_) {
        path += '.';
        path += key_;
    } else {
        path += '[' + std::to_string(index_) + ']';
    }
    return path;
}

void In::Fail(const std::string& what) const {
    throw Lib::SectionFault(Path() + ": " + what);
}

void In::RangeFail(long double min, long double max) const {
    if (!value_->is_number_integer()) Fail("expected an integer");
    Fail("expected an integer from " + Number(min) + " to " + Number(max));
}

std::string In::Str() const {
    if (!value_->is_string()) Fail("expected a string");
    return std::string(value_->String());
}

bool In::Bool() const {
    if (!value_->is_boolean()) Fail("expected true or false");
    return value_->Boolean();
}

const Value* In::Find(const char* key) const {
    if (!value_->is_object()) Fail("expected an object");
    // Members are mostly read in the order they were written: try the one after the last
    // read first. (Of a name given twice this may find the first; Done() refuses both.)
    const auto members = value_->Items();
    const std::string_view name(key);
    const Value* member = nullptr;
    if (next_ < members.size() && members[next_].Key() == name) {
        member = &members[next_];
    } else {
        member = value_->Find(name);
        if (!member) return nullptr;
    }
    const auto index = static_cast<std::size_t>(member - members.data());
    next_ = index + 1;
    if (index < 64) {
        read_ |= std::uint64_t{1} << index;
    } else {
        ++readBeyond_;
    }
    return member;
}

bool In::Has(const char* key) const {
    if (!value_->is_object()) Fail("expected an object");
    return value_->Find(key) != nullptr;
}

In In::Member(const char* key) const {
    const Value* member = Find(key);
    if (!member) Fail(std::string("missing member \"") + key + "\"");
    return In(*member, this, key, 0);
}

std::optional<In> In::OptMember(const char* key) const {
    const Value* member = Find(key);
    if (!member) return std::nullopt;
    return In(*member, this, key, 0);
}

std::string In::Str(const char* key, std::string_view fallback) const {
    auto member = OptMember(key);
    return member ? member->Str() : std::string(fallback);
}

bool In::Bool(const char* key, bool fallback) const {
    auto member = OptMember(key);
    return member ? member->Bool() : fallback;
}

std::optional<bool> In::OptBool(const char* key) const {
    auto member = OptMember(key);
    if (!member) return std::nullopt;
    return member->Bool();
}

std::optional<std::string> In::OptStr(const char* key) const {
    auto member = OptMember(key);
    if (!member) return std::nullopt;
    return member->Str();
}

std::vector<std::string> In::Strings(const char* key) const {
    std::vector<std::string> out;
    Each(key, [&](const In& element) { out.push_back(element.Str()); });
    return out;
}

void In::Done() const {
    if (!value_->is_object()) return;
    const auto read = static_cast<std::size_t>(std::popcount(read_)) + readBeyond_;
    if (read >= value_->size()) return;
    // Slow path, only when a member was not read: name the first that no read member names
    // (an unknown one), else the first whose name a read one has (given twice).
    const auto members = value_->Items();
    auto wasRead = [&](std::size_t i) { return i < 64 && (read_ >> i & 1) != 0; };
    auto nameRead = [&](std::string_view key) {
        for (std::size_t i = 0; i < members.size() && i < 64; ++i) {
            if (wasRead(i) && members[i].Key() == key) return true;
        }
        return false;
    };
    for (std::size_t i = 0; i < members.size() && i < 64; ++i) {
        if (!wasRead(i) && !nameRead(members[i].Key()))
            Fail("unknown member " + Lib::Quote(std::string(members[i].Key())));
    }
    for (std::size_t i = 0; i < members.size() && i < 64; ++i) {
        if (!wasRead(i)) Fail("member " + Lib::Quote(std::string(members[i].Key())) + " appears twice");
    }
    Fail("unknown member");
}

const Value* Value::Find(std::string_view key) const {
    if (!is_object()) return nullptr;
    for (std::size_t i = size_; i-- > 0;) {
        if (u_.items[i].Key() == key) return &u_.items[i];
    }
    return nullptr;
}

// A strict JSON parser (RFC 8259): UTF-8 text, no trailing commas, no comments, nothing
// after the value. Integers that fit are kept exactly (unsigned when not negative); other
// numbers become doubles. Nesting is limited so that no document can exhaust the stack.
class Parser {
public:
    Parser(std::string_view text, Document& document)
        : p_(text.data()), begin_(text.data()), end_(text.data() + text.size()), document_(document) {}

    void Parse() {
        Blanks();
        ParseValue(document_.root_, 0);
        Blanks();
        if (p_ != end_) Fail("unexpected text after the value");
    }

private:
    static constexpr int kMaxDepth = 512;

    [[noreturn]] void Fail(const std::string& what) const {
        throw Lib::SectionFault("syntax error at byte " + std::to_string(p_ - begin_) + ": " + what);
    }
    void Blanks() {
        while (p_ != end_ && (*p_ == ' ' || *p_ == '\n' || *p_ == '\t' || *p_ == '\r'))
            ++p_;
    }
    void Expect(char c, const char* what) {
        if (p_ == end_ || *p_ != c) Fail(p_ == end_ ? std::string("unexpected end of text") : what);
        ++p_;
    }
    void Literal(const char* word, std::size_t length) {
        if (static_cast<std::size_t>(end_ - p_) < length || std::memcmp(p_, word, length) != 0)
            Fail("unexpected character");
        p_ += length;
    }

    void ParseValue(Value& value, int depth) {
        if (p_ == end_) Fail("unexpected end of text");
        switch (*p_) {
            case '{':
                ParseObject(value, depth + 1);
                return;
            case '[':
                ParseArray(value, depth + 1);
                return;
            case '"': {
                value.kind_ = Value::Kind::kString;
                const std::string_view text = ParseString();
                value.u_.text = text.data();
                value.size_ = static_cast<std::uint32_t>(text.size());
                return;
            }
            case 't':
                Literal("true", 4);
                value.kind_ = Value::Kind::kBool;
                value.u_.boolean = true;
                return;
            case 'f':
                Literal("false", 5);
                value.kind_ = Value::Kind::kBool;
                value.u_.boolean = false;
                return;
            case 'n':
                Literal("null", 4);
                return;
            default:
                ParseNumber(value);
        }
    }

    // The members or elements of a value at one depth are gathered in a scratch list that
    // is kept from one value to the next, then copied side by side into the document.
    std::vector<Value>& ScratchItems(int depth) {
        auto at = static_cast<std::size_t>(depth);
        if (scratch_.size() <= at) scratch_.resize(at + 1);
        scratch_[at].clear();
        return scratch_[at];
    }
    // Room for count values side by side, in blocks the document owns.
    Value* Allocate(std::size_t count) {
        if (count > room_) {
            blockSize_ = std::min<std::size_t>(blockSize_ * 2, 65536);
            const std::size_t size = std::max(count, blockSize_);
            document_.blocks_.push_back(std::unique_ptr<Value[]>(new Value[size]));
            next_ = document_.blocks_.back().get();
            room_ = size;
        }
        Value* at = next_;
        next_ += count;
        room_ -= count;
        return at;
    }
    void Close(Value& value, std::vector<Value>& items) {
        if (items.size() > UINT32_MAX) Fail("too many values");
        Value* at = Allocate(items.size());
        std::copy(items.begin(), items.end(), at);
        value.u_.items = at;
        value.size_ = static_cast<std::uint32_t>(items.size());
        items.clear();
    }

    void ParseObject(Value& value, int depth) {
        if (depth > kMaxDepth) Fail("nested too deeply");
        value.kind_ = Value::Kind::kObject;
        value.u_.items = nullptr;
        ++p_;
        Blanks();
        if (p_ != end_ && *p_ == '}') {
            ++p_;
            return;
        }
        auto& items = ScratchItems(depth);
        while (true) {
            Blanks();
            if (p_ == end_ || *p_ != '"')
                Fail(p_ == end_ ? "unexpected end of text" : "expected a member name");
            const std::string_view key = ParseString();
            Blanks();
            Expect(':', "expected ':'");
            Blanks();
            Value member;
            ParseValue(member, depth);
            member.key_ = key.data();
            member.keySize_ = static_cast<std::uint32_t>(key.size());
            items.push_back(member);
            Blanks();
            if (p_ != end_ && *p_ == ',') {
                ++p_;
                continue;
            }
            Expect('}', "expected ',' or '}'");
            Close(value, items);
            return;
        }
    }

    void ParseArray(Value& value, int depth) {
        if (depth > kMaxDepth) Fail("nested too deeply");
        value.kind_ = Value::Kind::kArray;
        value.u_.items = nullptr;
        ++p_;
        Blanks();
        if (p_ != end_ && *p_ == ']') {
            ++p_;
            return;
        }
        auto& items = ScratchItems(depth);
        while (true) {
            Blanks();
            Value element;
            ParseValue(element, depth);
            items.push_back(element);
            Blanks();
            if (p_ != end_ && *p_ == ',') {
                ++p_;
                continue;
            }
            Expect(']', "expected ',' or ']'");
            Close(value, items);
            return;
        }
    }

    unsigned Hex4() {
        if (end_ - p_ < 4) Fail("unexpected end of text");
        unsigned code = 0;
        for (int i = 0; i < 4; ++i) {
            char c = *p_++;
            code <<= 4;
            if (c >= '0' && c <= '9') {
                code |= static_cast<unsigned>(c - '0');
            } else if (c >= 'a' && c <= 'f') {
                code |= static_cast<unsigned>(c - 'a' + 10);
            } else if (c >= 'A' && c <= 'F') {
                code |= static_cast<unsigned>(c - 'A' + 10);
            } else {
                Fail("expected four hexadecimal digits after \\u");
            }
        }
        return code;
    }

    static void AppendUtf8(std::string& out, unsigned code) {
        if (code < 0x80) {
            out += static_cast<char>(code);
        } else if (code < 0x800) {
            out += static_cast<char>(0xc0 | (code >> 6));
            out += static_cast<char>(0x80 | (code & 0x3f));
        } else if (code < 0x10000) {
            out += static_cast<char>(0xe0 | (code >> 12));
            out += static_cast<char>(0x80 | ((code >> 6) & 0x3f));
            out += static_cast<char>(0x80 | (code & 0x3f));
        } else {
            out += static_cast<char>(0xf0 | (code >> 18));
            out += static_cast<char>(0x80 | ((code >> 12) & 0x3f));
            out += static_cast<char>(0x80 | ((code >> 6) & 0x3f));
            out += static_cast<char>(0x80 | (code & 0x3f));
        }
    }

    // The length of the well-formed UTF-8 sequence at p_ (its first byte is 0x80 or more),
    // or 0.
    std::size_t Utf8Length() const {
        const auto* s = reinterpret_cast<const unsigned char*>(p_);
        std::size_t left = static_cast<std::size_t>(end_ - p_);
        auto tail = [&](std::size_t i) { return i < left && (s[i] & 0xc0) == 0x80; };
        unsigned char c = s[0];
        if (c >= 0xc2 && c <= 0xdf) return tail(1) ? 2 : 0;
        if (c >= 0xe0 && c <= 0xef) {
            if (!tail(1) || !tail(2)) return 0;
            if (c == 0xe0 && s[1] < 0xa0) return 0;   // overlong
            if (c == 0xed && s[1] >= 0xa0) return 0;  // a surrogate
            return 3;
        }
        if (c >= 0xf0 && c <= 0xf4) {
            if (!tail(1) || !tail(2) || !tail(3)) return 0;
            if (c == 0xf0 && s[1] < 0x90) return 0;   // overlong
            if (c == 0xf4 && s[1] >= 0x90) return 0;  // beyond U+10FFFF
            return 4;
        }
        return 0;
    }

    // A string starting at p_ ('"'): a view of the text when it has no escapes, else of its
    // decoded copy, kept by the document.
    std::string_view ParseString() {
        ++p_;  // the opening quote
        const char* start = p_;
#if defined(__SSE2__)
        // Plain bytes 16 at a time, up to the first quote, backslash, control character or
        // byte of a multi-byte sequence (signed, those are below 0x20 too).
        while (end_ - p_ >= 16) {
            const __m128i v = _mm_loadu_si128(reinterpret_cast<const __m128i*>(p_));
            const __m128i stops = _mm_or_si128(
                _mm_or_si128(_mm_cmpeq_epi8(v, _mm_set1_epi8('"')), _mm_cmpeq_epi8(v, _mm_set1_epi8('\\'))),
                _mm_cmplt_epi8(v, _mm_set1_epi8(0x20)));
            const auto mask = static_cast<unsigned>(_mm_movemask_epi8(stops));
            if (mask != 0) {
                p_ += std::countr_zero(mask);
                break;
            }
            p_ += 16;
        }
#endif
        while (p_ != end_) {
            const auto c = static_cast<unsigned char>(*p_);
            if (c == '"') {
                ++p_;
                return {start, static_cast<std::size_t>(p_ - 1 - start)};
            }
            if (c == '\\') break;
            if (c < 0x20) Fail("control character in a string");
            if (c < 0x80) {
                ++p_;
                continue;
            }
            const std::size_t length = Utf8Length();
            if (!length) Fail("a string is not valid UTF-8");
            p_ += length;
        }
        if (p_ == end_) Fail("a string is not closed");
        std::string& out = document_.decoded_.emplace_back(start, static_cast<std::size_t>(p_ - start));
        DecodeString(out);
        return out;
    }

    // The rest of a string, from p_, decoded into out.
    void DecodeString(std::string& out) {
        while (true) {
            // Plain bytes in one go.
            const char* start = p_;
            while (p_ != end_ && *p_ != '"' && *p_ != '\\' && static_cast<unsigned char>(*p_) >= 0x20 &&
                   static_cast<unsigned char>(*p_) < 0x80)
                ++p_;
            out.append(start, static_cast<std::size_t>(p_ - start));
            if (p_ == end_) Fail("a string is not closed");
            unsigned char c = static_cast<unsigned char>(*p_);
            if (c == '"') {
                ++p_;
                return;
            }
            if (c < 0x20) Fail("control character in a string");
            if (c >= 0x80) {
                std::size_t length = Utf8Length();
                if (!length) Fail("a string is not valid UTF-8");
                out.append(p_, length);
                p_ += length;
                continue;
            }
            // A backslash.
            ++p_;
            if (p_ == end_) Fail("a string is not closed");
            char e = *p_++;
            switch (e) {
                case '"':
                    out += '"';
                    break;
                case '\\':
                    out += '\\';
                    break;
                case '/':
                    out += '/';
                    break;
                case 'b':
                    out += '\b';
                    break;
                case 'f':
                    out += '\f';
                    break;
                case 'n':
                    out += '\n';
                    break;
                case 'r':
                    out += '\r';
                    break;
                case 't':
                    out += '\t';
                    break;
                case 'u': {
                    unsigned code = Hex4();
                    if (code >= 0xdc00 && code <= 0xdfff) Fail("a lone low surrogate in \\u escapes");
                    if (code >= 0xd800 && code <= 0xdbff) {
                        if (end_ - p_ < 2 || p_[0] != '\\' || p_[1] != 'u')
                            Fail("a lone high surrogate in \\u escapes");
                        p_ += 2;
                        unsigned low = Hex4();
                        if (low < 0xdc00 || low > 0xdfff) Fail("a lone high surrogate in \\u escapes");
                        code = 0x10000 + ((code - 0xd800) << 10) + (low - 0xdc00);
                    }
                    AppendUtf8(out, code);
                    break;
                }
                default:
                    --p_;
                    Fail("unknown escape in a string");
            }
        }
    }

    void ParseNumber(Value& value) {
        const char* start = p_;
        bool negative = false;
        if (*p_ == '-') {
            negative = true;
            ++p_;
        }
        auto digits = [&] {
            const char* from = p_;
            while (p_ != end_ && *p_ >= '0' && *p_ <= '9')
                ++p_;
            return p_ - from;
        };
        if (p_ == end_ || *p_ < '0' || *p_ > '9')
            Fail(p_ == start ? "unexpected character" : "expected digits");
        if (*p_ == '0') {
            ++p_;
        } else {
            digits();
        }
        bool integral = true;
        if (p_ != end_ && *p_ == '.') {
            ++p_;
            integral = false;
            if (digits() == 0) Fail("expected digits after '.'");
        }
        if (p_ != end_ && (*p_ == 'e' || *p_ == 'E')) {
            ++p_;
            integral = false;
            if (p_ != end_ && (*p_ == '+' || *p_ == '-')) ++p_;
            if (digits() == 0) Fail("expected digits in the exponent");
        }
        if (p_ != end_ && *p_ >= '0' && *p_ <= '9') Fail("a number has a leading zero");
        if (integral) {
            // Up to 18 digits cannot overflow: the value is taken as the digits go by.
            const char* digitsStart = negative ? start + 1 : start;
            if (p_ - digitsStart <= 18) {
                std::uint64_t v = 0;
                for (const char* d = digitsStart; d != p_; ++d)
                    v = v * 10 + static_cast<std::uint64_t>(*d - '0');
                if (negative) {
                    value.kind_ = Value::Kind::kInt;
                    value.u_.integer = -static_cast<std::int64_t>(v);
                } else {
                    value.kind_ = Value::Kind::kUnsigned;
                    value.u_.unsigned_ = v;
                }
                return;
            }
            if (negative) {
                std::int64_t v = 0;
                auto [at, error] = std::from_chars(start, p_, v);
                if (error == std::errc() && at == p_) {
                    value.kind_ = Value::Kind::kInt;
                    value.u_.integer = v;
                    return;
                }
            } else {
                std::uint64_t v = 0;
                auto [at, error] = std::from_chars(start, p_, v);
                if (error == std::errc() && at == p_) {
                    value.kind_ = Value::Kind::kUnsigned;
                    value.u_.unsigned_ = v;
                    return;
                }
            }
        }
        value.kind_ = Value::Kind::kDouble;
        value.u_.real = std::strtod(std::string(start, p_).c_str(), nullptr);
    }

    const char* p_;
    const char* begin_;
    const char* end_;
    Document& document_;
    Value* next_ = nullptr;
    std::size_t room_ = 0;
    std::size_t blockSize_ = 128;
    // By depth; a deque, so that the lists of outer values stay where they are.
    std::deque<std::vector<Value>> scratch_;
};

Document Parse(std::string_view text, const char* sectionName) {
    Document document;
    try {
        Parser(text, document).Parse();
    } catch (const Lib::SectionFault& e) {
        throw Lib::SectionFault(std::string(sectionName) + ": not valid JSON: " + Lib::Printable(e.what()));
    }
    return document;
}

namespace {

// Whether text is well-formed UTF-8 (no overlong forms, no surrogates, nothing beyond
// U+10FFFF).
bool WellFormedUtf8(std::string_view text) {
    const auto* s = reinterpret_cast<const unsigned char*>(text.data());
    const std::size_t n = text.size();
    std::size_t i = 0;
    auto tail = [&](std::size_t at) { return at < n && (s[at] & 0xc0) == 0x80; };
    while (i < n) {
        const unsigned char c = s[i];
        if (c < 0x80) {
            ++i;
        } else if (c >= 0xc2 && c <= 0xdf) {
            if (!tail(i + 1)) return false;
            i += 2;
        } else if (c >= 0xe0 && c <= 0xef) {
            if (!tail(i + 1) || !tail(i + 2)) return false;
            if ((c == 0xe0 && s[i + 1] < 0xa0) || (c == 0xed && s[i + 1] >= 0xa0)) return false;
            i += 3;
        } else if (c >= 0xf0 && c <= 0xf4) {
            if (!tail(i + 1) || !tail(i + 2) || !tail(i + 3)) return false;
            if ((c == 0xf0 && s[i + 1] < 0x90) || (c == 0xf4 && s[i + 1] >= 0x90)) return false;
            i += 4;
        } else {
            return false;
        }
    }
    return true;
}

// A string as the library's compact dump writes it (no ASCII-only escaping).
void WriteString(std::string_view text, std::string& out) {
    if (!WellFormedUtf8(text)) {
        // The library's own repair, byte for byte.
        out += Node(std::string(text)).dump(-1, ' ', false, Node::error_handler_t::replace);
        return;
    }
    static const char hex[] = "0123456789abcdef";
    out += '"';
    std::size_t plain = 0;
    for (std::size_t i = 0; i < text.size(); ++i) {
        const auto c = static_cast<unsigned char>(text[i]);
        if (c >= 0x20 && c != '"' && c != '\\') continue;
        out.append(text, plain, i - plain);
        plain = i + 1;
        switch (c) {
            case '"':
                out += "\\\"";
                break;
            case '\\':
                out += "\\\\";
                break;
            case '\b':
                out += "\\b";
                break;
            case '\f':
                out += "\\f";
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
                out += "\\u00";
                out += hex[c >> 4];
                out += hex[c & 0xf];
        }
    }
    out.append(text, plain, std::string_view::npos);
    out += '"';
}

template <typename Number>
void WriteNumber(Number value, std::string& out) {
    char digits[24];
    const auto end = std::to_chars(digits, digits + sizeof(digits), value);
    out.append(digits, end.ptr);
}

void Write(const Node& node, std::string& out) {
    using Type = Node::value_t;
    switch (node.type()) {
        case Type::null:
            out += "null";
            return;
        case Type::boolean:
            out += node.get<bool>() ? "true" : "false";
            return;
        case Type::number_integer:
            WriteNumber(node.get<std::int64_t>(), out);
            return;
        case Type::number_unsigned:
            WriteNumber(node.get<std::uint64_t>(), out);
            return;
        case Type::string:
            WriteString(node.get_ref<const std::string&>(), out);
            return;
        case Type::array: {
            out += '[';
            bool first = true;
            for (const auto& item : node.get_ref<const Node::array_t&>()) {
                if (!first) out += ',';
                first = false;
                Write(item, out);
            }
            out += ']';
            return;
        }
        case Type::object: {
            out += '{';
            bool first = true;
            for (const auto& [key, value] : node.get_ref<const Node::object_t&>()) {
                if (!first) out += ',';
                first = false;
                WriteString(key, out);
                out += ':';
                Write(value, out);
            }
            out += '}';
            return;
        }
        default:  // numbers with a fraction, and what the state never holds
            out += node.dump(-1, ' ', false, Node::error_handler_t::replace);
    }
}

}  // namespace

std::string Dump(const Node& node) {
    // The same text as the library's compact dump, written straight into one string.
    std::string out;
    Write(node, out);
    return out;
}

std::vector<std::uint8_t> HexBytes(const In& in) {
    std::string text = in.Str();
    if (text.size() % 2 != 0) in.Fail("expected an even number of hexadecimal digits");
    std::vector<std::uint8_t> bytes;
    bytes.reserve(text.size() / 2);
    auto digit = [&](char c) -> int {
        if (c >= '0' && c <= '9') return c - '0';
        if (c >= 'a' && c <= 'f') return c - 'a' + 10;
        if (c >= 'A' && c <= 'F') return c - 'A' + 10;
        in.Fail("expected hexadecimal digits");
    };
    for (std::size_t i = 0; i < text.size(); i += 2) {
        bytes.push_back(static_cast<std::uint8_t>(digit(text[i]) * 16 + digit(text[i + 1])));
    }
    return bytes;
}

std::string HexText(const std::vector<std::uint8_t>& bytes) {
    static const char digits[] = "0123456789abcdef";
    std::string text;
    text.reserve(bytes.size() * 2);
    for (auto b : bytes) {
        text += digits[b >> 4];
        text += digits[b & 0xf];
    }
    return text;
}

std::uint32_t NameToCode(const In& in, const char* const* names, std::size_t count) {
    std::string text = in.Str();
    std::string accepted;
    for (std::size_t i = 0; i < count; ++i) {
        if (!names[i]) continue;
        if (text == names[i]) return static_cast<std::uint32_t>(i);
        if (!accepted.empty()) accepted += ", ";
        accepted += names[i];
    }
    in.Fail("unknown value " + Lib::Quote(text) + " (expected one of: " + accepted + ")");
}

}  // namespace TknCtl::Json
