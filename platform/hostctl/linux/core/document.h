// The Linux host's own document: what the kernel has no notion of (interface tags, port-group
// names and VLAN IDs, names of IPsec associations and policies, the firewall's rulesets,
// netstacks added disabled, switch settings). One JSON object, {"version":1, "<member>": ...},
// one member per area.
//
// Reads take no lock: the file is read when a member is first asked for. A change takes an
// exclusive lock on "PATH.lock" (Lock(), through Context::BeginChange) and reads the file
// again, so that it changes what is there now; Commit writes it back, only when it changed,
// through a temporary file, fsync, rename and a directory fsync. It holds no secret: it is
// written mode 0644. A damaged file is refused (HostCtl::Lib::StateFileError naming it) and
// kept byte for byte.
#pragma once

#include <memory>
#include <string>

#include <nlohmann/json_fwd.hpp>

namespace TknCtl::Linux {

class Document {
public:
    explicit Document(std::string path);
    ~Document();
    Document(const Document&) = delete;
    Document& operator=(const Document&) = delete;

    const std::string& Path() const { return path_; }

    // A member for reading: null when the document does not have it.
    const nlohmann::json& Read(const std::string& member);
    // A member for changing (created null when missing); the document must be locked.
    nlohmann::json& Write(const std::string& member);

    // Takes the lock (waiting for another writer) and reads the file again. Throws
    // StateFileError when the lock or the file cannot be had.
    void Lock();
    bool IsLocked() const { return lockFd_ >= 0; }

    // The member is damaged: throws StateFileError naming the file, the member and the fault.
    [[noreturn]] void Refuse(const std::string& member, const std::string& fault) const;

    bool HasChanges() const;
    // Writes the document when it changed. Throws StateFileError; the file then stays as it was.
    void Commit();
    // Forgets every change since the file was read.
    void Discard();

private:
    void Load();

    std::string path_;
    int lockFd_ = -1;
    bool loaded_ = false;
    bool existed_ = false;
    std::unique_ptr<nlohmann::json> base_;     // as read
    std::unique_ptr<nlohmann::json> current_;  // as changed
};

}  // namespace TknCtl::Linux
