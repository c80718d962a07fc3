// Bases of the library's implementation objects.
#pragma once

namespace TknCtl::Lib {

// The base of the objects a command creates from the library. Refresh() brings the object's
// cached view of the host up to date.
class TknCtlObject {
public:
    TknCtlObject() = default;
    TknCtlObject(const TknCtlObject&) = default;
    TknCtlObject& operator=(const TknCtlObject&) = default;
    virtual ~TknCtlObject();

    virtual void Refresh();
};

// Objects whose state is read once and then kept: the stale flag says the state must be
// read again (Refresh) before it is used. A new object starts stale.
class Refreshable {
public:
    bool IsStale() const { return stale_; }
    void SetStale(bool stale) { stale_ = stale; }

private:
    bool stale_ = true;
};

}  // namespace TknCtl::Lib
