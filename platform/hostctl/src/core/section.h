// The typed sections of the host state document.
//
// The document is one JSON object: {"version":1, "<section>": ..., ...}, one section per
// entity kind. Each kind is a C++ type T of the model (src/model/<area>.h) with a static
// T::Kind() that describes the section: its name, how it is read from and written to JSON,
// and how it is checked. A section is parsed only when an operation first touches it:
//
//     const auto& nics = TknCtl::Lib::Read<TknCtl::Model::PnicsSection>();   // read only
//     auto& nics = TknCtl::Lib::Write<TknCtl::Model::PnicsSection>();        // will change it
//
// Both act on the current session's document and throw HostCtlException when no session is
// open. A reference stays valid for the rest of the session. Write marks the section
// changed: at commit it is serialised again; untouched sections keep their bytes.
//
// This header stays free of the JSON library; see json_section.h for defining a kind.
#pragma once

#include <memory>
#include <stdexcept>
#include <string>
#include <string_view>
#include <vector>

namespace TknCtl::Lib {

class Store;
class Checker;

// A fault in a section's content. Thrown by parsing and checking code; the store turns it
// into a HostCtl::Lib::StateFileError naming the file.
class SectionFault : public std::runtime_error {
public:
    using std::runtime_error::runtime_error;
    ~SectionFault() override;
};

// The parsed content of one section, whatever its type.
class SectionData {
public:
    virtual ~SectionData();
};

template <class T>
class SectionValue final : public SectionData {
public:
    T value;
};

// Describes one kind of section.
class SectionKind {
public:
    explicit SectionKind(const char* name) : name_(name) {}
    virtual ~SectionKind();
    const char* Name() const { return name_; }
    // Where the kind stands in AllSections() (set there), for finding its slot at once.
    std::size_t Position() const { return position_; }
    void SetPosition(std::size_t position) const { position_ = position; }

    // Parses the section's JSON text; throws SectionFault.
    virtual std::unique_ptr<SectionData> Parse(std::string_view text) const = 0;
    // The content of a section the document does not have.
    virtual std::unique_ptr<SectionData> Empty() const = 0;
    // Compact JSON text of the content.
    virtual std::string Serialize(const SectionData& data) const = 0;
    // Checks the content (unique names, references into other sections); throws
    // SectionFault through Checker::Fail.
    virtual void Validate(const SectionData& data, Checker& checker) const = 0;

private:
    const char* name_;
    mutable std::size_t position_ = static_cast<std::size_t>(-1);
};

// Every kind of section, in document order.
const std::vector<const SectionKind*>& AllSections();
// The kind named name, or nullptr.
const SectionKind* FindSection(std::string_view name);

// The document of the current session; throws HostCtlException when no session is open.
Store& CurrentStore();
// Throws HostCtlException("no host session is open") when no session is open, whichever
// host it manages.
void RequireSession();
// The content of one section of a document, parsed and checked on first use.
SectionData& Access(Store& store, const SectionKind& kind, bool forWrite);
const SectionData& Parsed(Store& store, const SectionKind& kind);

template <class T>
const T& Read() {
    return static_cast<const SectionValue<T>&>(Access(CurrentStore(), T::Kind(), false)).value;
}

template <class T>
T& Write() {
    return static_cast<SectionValue<T>&>(Access(CurrentStore(), T::Kind(), true)).value;
}

// Handed to a section's check: gives the other sections of the same document and reports
// faults. A check may read other sections; by convention large sections (ports,
// connections, neighbours, routes) are only ever the referring side, so that checking a
// small section never parses a large one.
class Checker {
public:
    explicit Checker(Store& store) : store_(store) {}

    // Another section, parsed: its own checks run when it is used itself.
    template <class T>
    const T& Get() {
        return static_cast<const SectionValue<T>&>(Parsed(store_, T::Kind())).value;
    }
    [[noreturn]] void Fail(const std::string& what) const;

private:
    Store& store_;
};

}  // namespace TknCtl::Lib
