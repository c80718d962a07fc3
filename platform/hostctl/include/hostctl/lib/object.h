// Bases of the library's implementation objects (TknCtl::...Impl).
#pragma once

namespace TknCtl::Lib {

// An implementation object is created for one invocation and reaches the host model
// through the current host session. Constructing one with no session open throws
// HostCtl::Lib::HostCtlException("no host session is open").
class TknCtlObject {
public:
    virtual ~TknCtlObject();

protected:
    TknCtlObject();
    TknCtlObject(const TknCtlObject&) = default;
    TknCtlObject& operator=(const TknCtlObject&) = default;
};

// The refreshable part of an object whose state is read from the host on demand: while
// the object is stale, callers Refresh() it before reading its state and then clear the
// flag. A new object is stale.
class Refreshable {
public:
    virtual ~Refreshable();
    virtual void Refresh() = 0;
    bool IsStale() const { return stale_; }
    void SetStale(bool stale) { stale_ = stale; }

protected:
    Refreshable() = default;
    Refreshable(const Refreshable&) = default;
    Refreshable& operator=(const Refreshable&) = default;

private:
    bool stale_ = true;
};

}  // namespace TknCtl::Lib
