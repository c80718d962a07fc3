// The state document of a session: its text, the byte range of each top-level section, and
// the sections parsed so far.
//
// A document as this library writes it ends with a member "digests" that gives the digest
// (core/digest.h) of each section's bytes: {"pnics":"0123456789abcdef",...}. A section whose
// bytes still have their digest is as the library wrote it, after checking it. One that has
// none, or another, was written by hand or damaged: see Verify.
#pragma once

#include <cstdint>
#include <cstdlib>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "core/section.h"

namespace TknCtl::Lib {

// The document's format version.
constexpr int kDocumentVersion = 1;

// The bytes of a document read from a file, in a block of memory from std::malloc or
// std::aligned_alloc.
struct FileText {
    struct Free {
        void operator()(char* block) const { std::free(block); }
    };
    std::unique_ptr<char, Free> block;
    std::size_t size = 0;
};

class Store {
public:
    // Scans text: it must be one complete JSON object whose members are "version" (equal to
    // kDocumentVersion), known sections and "digests" (of known sections), each at most once.
    // Sections are not parsed yet. Throws HostCtl::Lib::StateFileError whose message begins
    // with origin.
    Store(std::string text, std::string origin);
    Store(FileText text, std::string origin);

    const std::string& Origin() const { return origin_; }
    std::string_view Text() const { return text_; }

    // The section's content, parsed and checked on first use (a missing section is empty).
    // forWrite marks it changed. Throws StateFileError when it is not acceptable.
    SectionData& Get(const SectionKind& kind, bool forWrite);
    // The section's content, parsed but not necessarily checked: what the checks of other
    // sections look up (names, references). Its own checks run when it is used itself.
    const SectionData& Parsed(const SectionKind& kind);
    // Parses and checks every section.
    void LoadAll();
    // True when every section has the digest the document gives for it (and the document
    // gives none for a section it does not have): the document is as the library wrote it.
    // Else something was edited outside the library, and since the checks of one section
    // look into others, the whole document must be checked (LoadAll) before it is used.
    bool Verify() const;
    // Marks every section changed so that the next export writes all of them in the
    // canonical form.
    void RewriteAll();
    // True when a section was changed: its content now serialises differently from what the
    // document holds (a section written back unchanged, or only re-formatted, is no change).
    bool HasChanges() const;
    // The document with the current content of every section, as the pieces of text that
    // make it up (they stay valid while the snapshot and this store are unchanged), up to
    // its digests: see AddDigests.
    struct Snapshot {
        std::vector<std::optional<std::string>> serialized;  // per section, when re-serialised
        std::vector<std::optional<std::uint64_t>> digests;   // per section written (AddDigests)
        std::vector<std::string> names;                      // the texts between the sections
        std::vector<std::string_view> pieces;
    };
    Snapshot TakeSnapshot() const;
    // Whether the sections a snapshot re-serialised differ from the text they were read from.
    bool Differs(const Snapshot& snapshot) const;
    // Ends a snapshot that is to be written with the digest of each of its sections.
    void AddDigests(Snapshot& snapshot) const;
    // After a snapshot was written (AddDigests first): its re-serialised sections and their
    // digests are the document's now.
    void Committed(Snapshot snapshot);
    // Drops every change since the text was read or last committed: sections are parsed
    // again from their committed text when next used.
    void Discard();
    // The document with the current content of every section.
    std::string Export() const;
    // Makes text (an export of this store) the new base text; nothing is changed after it.
    void Rebase(std::string text);

private:
    struct Slot {
        const SectionKind* kind = nullptr;
        std::size_t begin = 0;
        std::size_t end = 0;
        bool present = false;
        bool dirty = false;
        bool checked = false;  // data has passed (or is passing) the section's checks
        std::unique_ptr<SectionData> data;
        std::unique_ptr<std::string> committed;  // the section's text since the last commit
        std::optional<std::uint64_t> recorded;   // the digest the document gives for it
        std::optional<std::uint64_t> digest;     // the digest of its text (when present)
    };

    Slot& SlotOf(const SectionKind& kind);
    void ParseSlot(Slot& slot);

    static constexpr std::string_view kHeader = "{\"version\":1";
    static constexpr std::string_view kTrailer = "\n}\n";

    // The section's text in the document as last read or committed.
    std::string_view Raw(const Slot& slot) const;

    void Scan();
    void ReadDigests(std::string_view member);
    [[noreturn]] void Refuse(const std::string& fault) const;

    std::string owned_;  // the text, when it came as a string
    FileText file_;      // the text, when it was read from a file
    std::string_view text_;
    std::string origin_;
    std::vector<Slot> slots_;  // in the order of AllSections()
};

}  // namespace TknCtl::Lib
