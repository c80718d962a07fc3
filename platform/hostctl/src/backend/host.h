// The contract between the library's operations and a real host.
//
// The operations of the library (the TknCtl::...Impl classes under src/network and
// src/system) run on the simulated host by default: they read and change the model of the
// state document. When the session manages a real host instead, they hand their work to that
// host's areas, declared here and in the area headers beside this one:
//
//     void DnsConfigImpl::SaveConfig() {
//         Lib::Enter("TknCtl::Network::DnsConfigImpl::SaveConfig", netstack_);
//         LoadIfStale();
//         if (auto* host = Lib::RealHost()) return host->GetDns().Write(netstack_, servers_, searchDomains_);
//         ... the simulated host ...
//     }
//
// The rules both hosts share (what a command may ask, how names and values are checked) stay
// in the operations; an area does what only the host can: read what it holds, and carry a
// change out or refuse it with a HostCtl::Lib::HostCtlException whose message says why.
//
// A real host is built as a module of its own (the Linux host: libhostctl-linux.so, under
// platform/hostctl/linux), loaded only when a session selects it, so that a run on the
// simulated host loads nothing of it.
#pragma once

#include <functional>
#include <string>

namespace TknCtl::Backend {

class Interfaces;  // interfaces.h: IP interfaces, their addresses, gateways and tags
class Routing;     // routing.h: routes and neighbours
class Dns;         // dns.h: resolver configuration
class Netstacks;   // netstacks.h: netstack instances, global IP settings, connections
class Ipsec;       // ipsec.h: security associations and policies
class Firewall;    // firewall.h: the host firewall
class Nics;        // nics.h: physical NICs
class Switches;    // switches.h: virtual switches, port groups and their policies

// Where a real host's dry run reports each kernel request it would make, as one line. last
// marks the line that ends the dry run early (what the real run would do next): whatever is
// reported after it, while the program unwinds, is dropped.
using DryRunRecorder = std::function<void(const std::string& line, bool last)>;

class Host {
public:
    virtual ~Host();

    // What the host is, for messages ("Linux host").
    virtual std::string Describe() const = 0;

    virtual Interfaces& GetInterfaces() = 0;
    virtual Routing& GetRouting() = 0;
    virtual Dns& GetDns() = 0;
    virtual Netstacks& GetNetstacks() = 0;
    virtual Ipsec& GetIpsec() = 0;
    virtual Firewall& GetFirewall() = 0;
    virtual Nics& GetNics() = 0;
    virtual Switches& GetSwitches() = 0;

    // The end of a command that ran to its end: what the host keeps beside the kernel (names,
    // tags, settings the kernel has no notion of) is stored when it changed. Throws
    // HostCtl::Lib::StateFileError when it cannot be stored.
    virtual void Commit() = 0;
    // Forgets what Commit would store.
    virtual void Discard() = 0;
    // True when Commit would store something.
    virtual bool HasChanges() const = 0;
    // From now on the host changes nothing: each kernel request is reported to record instead
    // of being made (reads still reach the kernel), the host's own document is never written
    // (Commit keeps its changes in memory), and a check that reads back a change is left out.
    virtual void StartDryRun(DryRunRecorder record) = 0;

    // Changes that roll back by themselves, on a host that keeps checkpoints (the Linux host;
    // by default a host keeps none and these throw HostCtl::Lib::HostCtlException saying so).
    // ConfirmWithin: before the first change of the session a checkpoint is taken of what it may
    // change; unless ConfirmCheckpoint runs within that many seconds (in any session), the
    // host restores it by itself, whatever becomes of this process.
    virtual void ConfirmWithin(unsigned seconds);
    // BeginAtomic: a checkpoint is taken before the first change; EndAtomic(false) restores it
    // at once, EndAtomic(true) drops it (or leaves it to ConfirmWithin's deadline).
    virtual void BeginAtomic();
    virtual void EndAtomic(bool keep);
    // The pending checkpoint: the changes made since are kept / undone now.
    virtual void ConfirmCheckpoint();
    virtual void RollbackCheckpoint();
};

}  // namespace TknCtl::Backend

namespace TknCtl::Lib {

// The real host the current session manages, or nullptr when it manages the simulated host
// (or no session is open).
Backend::Host* RealHost();

}  // namespace TknCtl::Lib
