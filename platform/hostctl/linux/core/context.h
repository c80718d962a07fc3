// What every area of the Linux host shares within one session: the configuration, the host's
// own document, the netstacks (network namespaces) and the discipline of changes.
#pragma once

#include <memory>
#include <set>
#include <string>
#include <vector>

#include "core/config.h"
#include "core/document.h"
#include "kernel/dryrun.h"
#include "kernel/netlink.h"

namespace TknCtl::Linux {

class Checkpoints;

class Context {
public:
    // The netstack of the namespace the program runs in.
    static constexpr const char* kDefaultNetstack = "defaultTcpipStack";
    // The refusal of a change without the privilege it needs.
    static constexpr const char* kNeedsRoot = "Changing the host's network needs root (CAP_NET_ADMIN)";

    explicit Context(Config config);
    // A dry run the context started ends with it.
    ~Context();
    Context(const Context&) = delete;
    Context& operator=(const Context&) = delete;

    const Config& GetConfig() const { return config_; }
    Document& GetDocument() { return document_; }

    // Every operation that changes the host calls this before it changes anything: without
    // CAP_NET_ADMIN it throws HostCtlException(kNeedsRoot), in a dry run too (the real run
    // would be refused); then it takes the document's lock (once per session) so that what the
    // command stores lands on what is there now (a dry run, which writes nothing, takes none).
    void BeginChange();
    // From now on kernel changes are recorded instead of made (kernel/dryrun.h), and the
    // document is kept in memory only.
    void StartDryRun(Kernel::DryRunRecorder record);
    // Whether the program has CAP_NET_ADMIN.
    static bool HasNetAdmin();

    // The host's checkpoints (core/checkpoint.h): BeginChange takes one, or joins the pending
    // one, before the first change of a session that asked for it.
    Checkpoints& GetCheckpoints();
    // A change that no checkpoint can take back (what: what a checkpoint does not hold, such as
    // "the settings of a NIC's driver"): throws HostCtlException while the session's changes are
    // to be rolled back (--confirm-within, an atomic batch, a pending checkpoint). Call it
    // before BeginChange.
    void RequireUndoable(const std::string& what);
    // What a checkpoint does not hold of a NIC, for RequireUndoable.
    static constexpr const char* kDriverSettings = "the settings of a NIC's driver (ethtool)";

    // The netstacks the kernel has: the default first, then the named namespaces of
    // /run/netns in name order (with those a dry run would make).
    std::vector<std::string> Netstacks() const;
    bool HasNetstack(const std::string& netstack) const;
    // The namespace of a netstack the kernel has; throws HostCtlException("Netstack instance
    // 'NAME' does not exist") for any other. An empty name is the default netstack.
    Kernel::Namespace NamespaceOf(const std::string& netstack) const;

    // A warning for the user (a netstack left out of a listing, say): one line on stderr,
    // each text once per session.
    void Warn(const std::string& text);

    bool HasChanges() const { return document_.HasChanges(); }
    void Commit() { document_.Commit(); }
    void Discard() { document_.Discard(); }

private:
    Config config_;
    Document document_;
    std::set<std::string> warned_;
    bool dryRun_ = false;
    std::unique_ptr<Checkpoints> checkpoints_;
};

}  // namespace TknCtl::Linux
