#include "core/store.h"

#include <algorithm>
#include <bit>
#include <cstdint>
#include <cstring>
#if defined(__SSE2__)
#include <emmintrin.h>
#endif

#include "core/digest.h"
#include "core/text.h"
#include "hostctl/exception.h"
#include "hostctl/session.h"

namespace TknCtl::Lib {

using HostCtl::Lib::StateFileError;

SectionFault::~SectionFault() = default;
SectionData::~SectionData() = default;
SectionKind::~SectionKind() = default;

void Checker::Fail(const std::string& what) const {
    throw SectionFault(what);
}

const SectionKind* FindSection(std::string_view name) {
    for (const auto* kind : AllSections()) {
        if (name == kind->Name()) return kind;
    }
    return nullptr;
}

SectionData& Access(Store& store, const SectionKind& kind, bool forWrite) {
    return store.Get(kind, forWrite);
}

const SectionData& Parsed(Store& store, const SectionKind& kind) {
    return store.Parsed(kind);
}

namespace {

// The bytes that matter when skipping a value, as masks over 16 bytes from p (bit i for
// p[i]): quotes, backslashes and brackets. Brackets are found as '{' or '}' with the bit
// that tells '[' from '{' (0x20) set: no other byte maps to those.
struct Marks {
    std::uint32_t quotes;
    std::uint32_t backslashes;
    std::uint32_t brackets;
};

Marks Marks16(const char* p) {
#if defined(__SSE2__)
    const __m128i v = _mm_loadu_si128(reinterpret_cast<const __m128i*>(p));
    const __m128i folded = _mm_or_si128(v, _mm_set1_epi8(0x20));
    const __m128i brackets =
        _mm_or_si128(_mm_cmpeq_epi8(folded, _mm_set1_epi8('{')), _mm_cmpeq_epi8(folded, _mm_set1_epi8('}')));
    return {static_cast<std::uint32_t>(_mm_movemask_epi8(_mm_cmpeq_epi8(v, _mm_set1_epi8('"')))),
            static_cast<std::uint32_t>(_mm_movemask_epi8(_mm_cmpeq_epi8(v, _mm_set1_epi8('\\')))),
            static_cast<std::uint32_t>(_mm_movemask_epi8(brackets))};
#else
    Marks marks{0, 0, 0};
    for (int i = 0; i < 16; ++i) {
        const char c = p[i];
        const char folded = static_cast<char>(c | 0x20);
        const std::uint32_t bit = std::uint32_t{1} << i;
        if (c == '"') marks.quotes |= bit;
        if (c == '\\') marks.backslashes |= bit;
        if (folded == '{' || folded == '}') marks.brackets |= bit;
    }
    return marks;
#endif
}

// The same over 64 bytes.
struct Marks64 {
    std::uint64_t quotes = 0;
    std::uint64_t backslashes = 0;
    std::uint64_t brackets = 0;
};

Marks64 MarksOf64(const char* p) {
    Marks64 marks;
    for (int i = 0; i < 4; ++i) {
        const Marks part = Marks16(p + 16 * i);
        marks.quotes |= std::uint64_t{part.quotes} << (16 * i);
        marks.backslashes |= std::uint64_t{part.backslashes} << (16 * i);
        marks.brackets |= std::uint64_t{part.brackets} << (16 * i);
    }
    return marks;
}

// Bit i set when an odd number of bits at i and below are set in mask: with the quotes of a
// block, the bytes inside strings (the opening quote included).
std::uint64_t PrefixXor(std::uint64_t mask) {
    mask ^= mask << 1;
    mask ^= mask << 2;
    mask ^= mask << 4;
    mask ^= mask << 8;
    mask ^= mask << 16;
    mask ^= mask << 32;
    return mask;
}

[[gnu::noinline, gnu::cold]] std::string Mismatched(char c, std::size_t at) {
    return "mismatched '" + std::string(1, c) + "' at byte " + std::to_string(at);
}

// A forward-only reader of the document's top level. It knows enough JSON to find where
// each value ends (strings with escapes, nested brackets) without building anything.
class Scanner {
public:
    explicit Scanner(std::string_view text) : text_(text) {}

    std::size_t pos = 0;
    // When set, a container skipped is also added to the digester up to hashed, 4 KiB at a
    // time while its bytes are still in the cache; the caller adds the rest.
    Digester* digester = nullptr;
    std::size_t hashed = 0;

    bool AtEnd() const { return pos >= text_.size(); }
    char Peek() const { return text_[pos]; }
    void SkipBlanks() {
        while (pos < text_.size() &&
               (text_[pos] == ' ' || text_[pos] == '\t' || text_[pos] == '\n' || text_[pos] == '\r')) {
            ++pos;
        }
    }
    // Skips a string starting at pos ('"'); false when the text ends inside it.
    bool SkipString() {
        ++pos;
        const char* data = text_.data();
        const std::size_t size = text_.size();
        while (pos < size) {
            // Jump to the next quote; a backslash before it may escape it.
            const void* quote = std::memchr(data + pos, '"', size - pos);
            if (!quote) {
                pos = size;
                return false;
            }
            std::size_t at = static_cast<std::size_t>(static_cast<const char*>(quote) - data);
            std::size_t backslashes = 0;
            while (at - backslashes > pos && data[at - backslashes - 1] == '\\')
                ++backslashes;
            pos = at + 1;
            if (backslashes % 2 == 0) return true;
        }
        return false;
    }
    // Skips an object or array at pos. The text goes by 64 bytes at a time: where a block has
    // no backslash, the quotes tell at once which bytes lie inside strings and only the
    // brackets outside them are visited; else every byte that matters is, in order.
    std::string SkipContainer() {
        // The closing brackets still due, innermost last (most documents nest a few levels).
        std::vector<char> closers(32);
        std::size_t depth = 0;
        const char* data = text_.data();
        const std::size_t size = text_.size();
        bool inString = false;
        bool escaped = false;  // a backslash ended the last block: the next byte is escaped
        char tail[64];
        // A bracket outside strings (there is one every few bytes: kept inline and small);
        // true when it closed the container (pos is then past it), or when it does not match
        // (fault set).
        auto bracket = [&](char c, std::size_t at, std::string& fault) __attribute__((always_inline)) {
            if (c == '{' || c == '[') {
                if (depth == closers.size()) closers.resize(2 * depth);
                closers[depth++] = c == '{' ? '}' : ']';
                return false;
            }
            pos = at + 1;
            if (depth == 0 || closers[depth - 1] != c) {
                fault = Mismatched(c, at);
                return true;
            }
            return --depth == 0;
        };
        std::string fault;
        for (std::size_t base = pos; base < size; base += 64) {
            // What lies before this block is inside the container.
            if (digester && base - hashed >= kHashedAtOnce) {
                digester->AddBlocks(text_.substr(hashed, base - hashed));
                hashed = base;
            }
            const std::size_t width = std::min<std::size_t>(64, size - base);
            const char* block = data + base;
            if (width < 64) {
                std::memset(tail, ' ', sizeof(tail));
                std::memcpy(tail, block, width);
                block = tail;
            }
            const Marks64 marks = MarksOf64(block);
            if (marks.backslashes == 0 && !escaped) {
                std::uint64_t inside = PrefixXor(marks.quotes);
                if (inString) inside = ~inside;
                inString = (inside >> 63) != 0;
                for (std::uint64_t outer = marks.brackets & ~inside; outer != 0; outer &= outer - 1) {
                    const auto bit = static_cast<std::size_t>(std::countr_zero(outer));
                    if (bracket(block[bit], base + bit, fault)) return fault;
                }
                continue;
            }
            std::uint64_t mask = marks.quotes | marks.backslashes | marks.brackets;
            if (escaped) {
                mask &= ~std::uint64_t{1};
                escaped = false;
            }
            while (mask != 0) {
                const auto bit = static_cast<std::size_t>(std::countr_zero(mask));
                mask &= mask - 1;
                const char c = block[bit];
                if (inString) {
                    if (c == '"') {
                        inString = false;
                    } else if (c == '\\') {
                        if (bit + 1 < 64) {
                            mask &= ~(std::uint64_t{1} << (bit + 1));
                        } else {
                            escaped = true;
                        }
                    }
                } else if (c == '"') {
                    inString = true;
                } else if (c != '\\') {  // a backslash outside strings: left for the parser
                    if (bracket(c, base + bit, fault)) return fault;
                }
            }
        }
        pos = size;
        return "truncated";
    }

    // Skips one value; returns an empty string on success, else the fault.
    std::string SkipValue() {
        if (AtEnd()) return "truncated";
        char c = Peek();
        if (c == '"') return SkipString() ? std::string() : "truncated";
        if (c == '{' || c == '[') return SkipContainer();
        std::size_t start = pos;
        while (pos < text_.size() && std::strchr(",}] \t\r\n", text_[pos]) == nullptr)
            ++pos;
        if (pos == start) return "missing value at byte " + std::to_string(pos);
        return {};
    }

private:
    static constexpr std::size_t kHashedAtOnce = 4096;  // a multiple of the blocks
    std::string_view text_;
};

}  // namespace

Store::Store(std::string text, std::string origin) : owned_(std::move(text)), origin_(std::move(origin)) {
    text_ = owned_;
    for (const auto* kind : AllSections()) {
        Slot slot;
        slot.kind = kind;
        slots_.push_back(std::move(slot));
    }
    Scan();
}

Store::Store(FileText text, std::string origin) : file_(std::move(text)), origin_(std::move(origin)) {
    text_ = std::string_view(file_.block.get(), file_.size);
    for (const auto* kind : AllSections()) {
        Slot slot;
        slot.kind = kind;
        slots_.push_back(std::move(slot));
    }
    Scan();
}

void Store::Refuse(const std::string& fault) const {
    throw StateFileError(origin_ + ": " + fault);
}

void Store::Scan() {
    Scanner scan(text_);
    scan.SkipBlanks();
    if (scan.AtEnd()) Refuse("the document is empty");
    if (scan.Peek() != '{') Refuse("not a state document (it does not begin with '{')");
    ++scan.pos;
    bool versionSeen = false;
    std::optional<std::string_view> digests;
    std::string current = "the document";
    auto truncated = [&] { Refuse("truncated document (it ends inside " + current + ")"); };
    scan.SkipBlanks();
    if (!scan.AtEnd() && scan.Peek() == '}') {
        ++scan.pos;
    } else {
        while (true) {
            if (scan.AtEnd()) truncated();
            if (scan.Peek() != '"') Refuse("expected a section name at byte " + std::to_string(scan.pos));
            std::size_t keyStart = scan.pos + 1;
            if (!scan.SkipString()) truncated();
            std::string key(text_.substr(keyStart, scan.pos - 1 - keyStart));
            current = "section " + Quote(key);
            scan.SkipBlanks();
            if (scan.AtEnd()) truncated();
            if (scan.Peek() != ':') Refuse("expected ':' after " + current);
            ++scan.pos;
            scan.SkipBlanks();
            std::size_t valueStart = scan.pos;
            // A section's digest is taken as it is skipped.
            Digester digester;
            const bool section = FindSection(key) != nullptr;
            scan.digester = section ? &digester : nullptr;
            scan.hashed = valueStart;
            std::string fault = scan.SkipValue();
            if (fault == "truncated") truncated();
            if (!fault.empty()) Refuse(current + ": " + fault);
            std::size_t valueEnd = scan.pos;

            if (key == "version") {
                if (versionSeen) Refuse("\"version\" appears twice");
                versionSeen = true;
                std::string value(text_.substr(valueStart, valueEnd - valueStart));
                if (value != std::to_string(kDocumentVersion)) {
                    Refuse("unsupported version " + Quote(value) + " (this program reads version " +
                           std::to_string(kDocumentVersion) + ")");
                }
            } else if (key == "digests") {
                if (digests) Refuse("\"digests\" appears twice");
                digests = text_.substr(valueStart, valueEnd - valueStart);
            } else {
                Slot* slot = nullptr;
                for (auto& candidate : slots_) {
                    if (key == candidate.kind->Name()) slot = &candidate;
                }
                if (!slot) Refuse("unknown section " + Quote(key));
                if (slot->present) Refuse(current + " appears twice");
                slot->present = true;
                slot->begin = valueStart;
                slot->end = valueEnd;
                slot->digest = digester.Finish(text_.substr(scan.hashed, valueEnd - scan.hashed));
            }

            scan.SkipBlanks();
            if (scan.AtEnd()) truncated();
            if (scan.Peek() == ',') {
                ++scan.pos;
                scan.SkipBlanks();
                continue;
            }
            if (scan.Peek() == '}') {
                ++scan.pos;
                break;
            }
            Refuse("expected ',' or '}' after " + current + " at byte " + std::to_string(scan.pos));
        }
    }
    scan.SkipBlanks();
    if (!scan.AtEnd()) Refuse("unexpected text after the document at byte " + std::to_string(scan.pos));
    if (!versionSeen) Refuse("the document has no \"version\"");
    if (digests) ReadDigests(*digests);
}

// The value of "digests": an object whose members name sections and give their digests.
// (The scan has found where it ends: its brackets match and its strings end.)
void Store::ReadDigests(std::string_view member) {
    std::size_t at = 0;
    auto fail = [&](const std::string& what) { Refuse("\"digests\": " + what); };
    auto blanks = [&] {
        while (at < member.size() &&
               (member[at] == ' ' || member[at] == '\t' || member[at] == '\n' || member[at] == '\r'))
            ++at;
    };
    // A string without escapes (no section name and no digest has any).
    auto text = [&](const char* what) {
        blanks();
        if (at >= member.size() || member[at] != '"') fail(std::string("expected ") + what);
        const std::size_t begin = ++at;
        while (at < member.size() && member[at] != '"' && member[at] != '\\')
            ++at;
        if (at >= member.size() || member[at] != '"') fail(std::string("expected ") + what);
        return member.substr(begin, at++ - begin);
    };
    blanks();
    if (at >= member.size() || member[at] != '{') fail("expected an object");
    ++at;
    blanks();
    if (at < member.size() && member[at] == '}') return;
    while (true) {
        const std::string_view name = text("a section name");
        blanks();
        if (at >= member.size() || member[at] != ':') fail("expected ':' after " + Quote(name));
        ++at;
        const std::string_view value = text("a digest");
        Slot* slot = nullptr;
        for (auto& candidate : slots_) {
            if (name == candidate.kind->Name()) slot = &candidate;
        }
        if (!slot) fail("unknown section " + Quote(name));
        if (slot->recorded) fail(Quote(name) + " appears twice");
        slot->recorded = ParseDigest(value);
        if (!slot->recorded) fail(Quote(name) + ": expected 16 hexadecimal digits, not " + Quote(value));
        blanks();
        if (at < member.size() && member[at] == ',') {
            ++at;
            continue;
        }
        if (at < member.size() && member[at] == '}') break;
        fail("expected ',' or '}' after " + Quote(name));
    }
}

bool Store::Verify() const {
    for (const auto& slot : slots_) {
        if (slot.present != slot.recorded.has_value()) return false;
        if (slot.present && slot.digest != slot.recorded) return false;
    }
    return true;
}

Store::Slot& Store::SlotOf(const SectionKind& kind) {
    if (kind.Position() < slots_.size() && slots_[kind.Position()].kind == &kind)
        return slots_[kind.Position()];
    for (auto& candidate : slots_) {
        if (candidate.kind == &kind) return candidate;
    }
    throw HostCtl::Lib::HostCtlException(std::string("unknown section kind ") + kind.Name());
}

void Store::ParseSlot(Slot& slot) {
    if (slot.data) return;
    try {
        slot.data = slot.present ? slot.kind->Parse(Raw(slot)) : slot.kind->Empty();
    } catch (const SectionFault& fault) {
        Refuse(fault.what());
    }
}

const SectionData& Store::Parsed(const SectionKind& kind) {
    Slot& slot = SlotOf(kind);
    ParseSlot(slot);
    return *slot.data;
}

SectionData& Store::Get(const SectionKind& kind, bool forWrite) {
    Slot& slot = SlotOf(kind);
    ParseSlot(slot);
    if (!slot.checked) {
        // Marked before the checks run, so that a check of another section that looks back
        // at this one finds it in place.
        slot.checked = true;
        try {
            Checker checker(*this);
            kind.Validate(*slot.data, checker);
        } catch (const SectionFault& fault) {
            slot.data.reset();
            slot.checked = false;
            Refuse(std::string(kind.Name()) + ": " + fault.what());
        } catch (...) {
            slot.data.reset();
            slot.checked = false;
            throw;
        }
    }
    if (forWrite) slot.dirty = true;
    return *slot.data;
}

void Store::LoadAll() {
    for (auto& slot : slots_)
        Get(*slot.kind, false);
}

void Store::RewriteAll() {
    for (auto& slot : slots_)
        Get(*slot.kind, true);
}

std::string_view Store::Raw(const Slot& slot) const {
    if (slot.committed) return *slot.committed;
    return text_.substr(slot.begin, slot.end - slot.begin);
}

bool Store::HasChanges() const {
    return Differs(TakeSnapshot());
}

bool Store::Differs(const Snapshot& snapshot) const {
    for (std::size_t i = 0; i < slots_.size(); ++i) {
        if (!snapshot.serialized[i]) continue;
        const auto& slot = slots_[i];
        if (slot.present) {
            if (Raw(slot) != *snapshot.serialized[i]) return true;
        } else if (*snapshot.serialized[i] != slot.kind->Serialize(*slot.kind->Empty())) {
            return true;
        }
    }
    return false;
}

Store::Snapshot Store::TakeSnapshot() const {
    Snapshot snapshot;
    snapshot.serialized.resize(slots_.size());
    snapshot.names.reserve(slots_.size() + 1);  // never moved: pieces point into them
    snapshot.pieces.push_back(kHeader);
    for (std::size_t i = 0; i < slots_.size(); ++i) {
        const auto& slot = slots_[i];
        std::string_view content;
        if (slot.data && slot.dirty) {
            snapshot.serialized[i] = slot.kind->Serialize(*slot.data);
            content = *snapshot.serialized[i];
        } else if (slot.present) {
            content = Raw(slot);
        } else {
            continue;
        }
        snapshot.names.push_back(",\n\"" + std::string(slot.kind->Name()) + "\":");
        snapshot.pieces.push_back(snapshot.names.back());
        snapshot.pieces.push_back(content);
    }
    return snapshot;
}

void Store::AddDigests(Snapshot& snapshot) const {
    snapshot.digests.assign(slots_.size(), std::nullopt);
    std::string member = ",\n\"digests\":{";
    member.reserve(member.size() + slots_.size() * 32);
    for (std::size_t i = 0; i < slots_.size(); ++i) {
        const auto& slot = slots_[i];
        if (snapshot.serialized[i]) {
            snapshot.digests[i] = Digest(*snapshot.serialized[i]);
        } else if (slot.present) {
            // Unchanged: its digest is known since the scan (or the last commit).
            snapshot.digests[i] = slot.digest ? *slot.digest : Digest(Raw(slot));
        } else {
            continue;
        }
        if (member.back() != '{') member += ',';
        member += '"';
        member += slot.kind->Name();
        member += "\":\"";
        member += DigestText(*snapshot.digests[i]);
        member += '"';
    }
    member += '}';
    snapshot.names.push_back(std::move(member));
    snapshot.pieces.push_back(snapshot.names.back());
    snapshot.pieces.push_back(kTrailer);
}

void Store::Committed(Snapshot snapshot) {
    for (std::size_t i = 0; i < slots_.size(); ++i) {
        if (i < snapshot.digests.size() && snapshot.digests[i]) slots_[i].digest = snapshot.digests[i];
        if (!snapshot.serialized[i]) continue;
        slots_[i].committed = std::make_unique<std::string>(std::move(*snapshot.serialized[i]));
        slots_[i].present = true;
        slots_[i].dirty = false;
    }
}

void Store::Discard() {
    for (auto& slot : slots_) {
        if (!slot.dirty) continue;
        slot.data.reset();
        slot.checked = false;
        slot.dirty = false;
    }
}

std::string Store::Export() const {
    Snapshot snapshot = TakeSnapshot();
    AddDigests(snapshot);
    std::size_t size = 0;
    for (auto piece : snapshot.pieces)
        size += piece.size();
    std::string out;
    out.reserve(size);
    for (auto piece : snapshot.pieces)
        out.append(piece);
    return out;
}

void Store::Rebase(std::string text) {
    owned_ = std::move(text);
    file_ = FileText();
    text_ = owned_;
    for (auto& slot : slots_) {
        slot.present = false;
        slot.dirty = false;
        slot.committed.reset();
        slot.recorded.reset();
        slot.digest.reset();
    }
    Scan();
}

}  // namespace TknCtl::Lib
