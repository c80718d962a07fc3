// The state document of a session: its text, the byte range of each top-level section, and
// the sections parsed so far.
#pragma once

#include <memory>
#include <string>
#include <vector>

#include "core/section.h"

namespace TknCtl::Lib {

// The document's format version.
constexpr int kDocumentVersion = 1;

class Store {
public:
    // Scans text: it must be one complete JSON object whose members are "version" (equal to
    // kDocumentVersion) and known sections, each at most once. Sections are not parsed yet.
    // Throws HostCtl::Lib::StateFileError whose message begins with origin.
    Store(std::string text, std::string origin);

    const std::string& Origin() const { return origin_; }
    const std::string& Text() const { return text_; }

    // The section's content, parsed and checked on first use (a missing section is empty).
    // forWrite marks it changed. Throws StateFileError when it is not acceptable.
    SectionData& Get(const SectionKind& kind, bool forWrite);
    // Parses and checks every section.
    void LoadAll();
    // Marks every section changed so that the next export writes all of them in the
    // canonical form.
    void RewriteAll();
    // True when a section was changed: its content now serialises differently from what the
    // document holds (a section written back unchanged, or only re-formatted, is no change).
    bool HasChanges() const;
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
        std::unique_ptr<SectionData> data;
    };

    void Scan();
    [[noreturn]] void Refuse(const std::string& fault) const;

    std::string text_;
    std::string origin_;
    std::vector<Slot> slots_;  // in the order of AllSections()
};

}  // namespace TknCtl::Lib
