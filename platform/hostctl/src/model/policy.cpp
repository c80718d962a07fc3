#include "model/policy.h"

#include "core/json_io.h"

namespace TknCtl::Model {

using Json::In;
using Json::Node;

Policy LoadPolicy(const In& in) {
    Policy p;
    if (auto t = in.OptMember("teaming")) {
        p.teaming.policy = t->OptInt<std::uint32_t>("policy");
        p.teaming.notifySwitches = t->OptBool("notifySwitches");
        p.teaming.rollingRestoration = t->OptBool("rollingRestoration");
        if (auto criteria = t->OptMember("linkCriteria")) {
            p.teaming.linkCriteria = LinkCriteria{criteria->OptBool("beacon")};
            criteria->Done();
        }
        if (t->Has("uplinkOrder")) p.teaming.uplinkOrder = t->Strings("uplinkOrder");
        p.teaming.maxActive = t->OptInt<std::int32_t>("maxActive");
        t->Done();
    }
    if (auto s = in.OptMember("security")) {
        p.security.allowPromiscuous = s->OptBool("allowPromiscuous");
        p.security.allowMacChange = s->OptBool("allowMacChange");
        p.security.allowForgedTransmits = s->OptBool("allowForgedTransmits");
        s->Done();
    }
    if (auto s = in.OptMember("shaping")) {
        p.shaping.enabled = s->OptBool("enabled");
        p.shaping.averageBps = s->OptInt<std::uint64_t>("averageBps");
        p.shaping.peakBps = s->OptInt<std::uint64_t>("peakBps");
        p.shaping.burstSize = s->OptInt<std::uint64_t>("burstSize");
        s->Done();
    }
    in.Done();
    return p;
}

namespace {

template <class T>
void Put(Node& node, const char* key, const std::optional<T>& value) {
    if (value) Json::Append(node, key, *value);
}

template <class T>
void Lay(std::optional<T>& base, const std::optional<T>& over) {
    if (over) base = over;
}

}  // namespace

TeamingPolicy Overlay(const TeamingPolicy& base, const TeamingPolicy& over) {
    TeamingPolicy out = base;
    Lay(out.policy, over.policy);
    Lay(out.notifySwitches, over.notifySwitches);
    Lay(out.rollingRestoration, over.rollingRestoration);
    Lay(out.linkCriteria, over.linkCriteria);
    Lay(out.uplinkOrder, over.uplinkOrder);
    Lay(out.maxActive, over.maxActive);
    return out;
}

SecurityPolicy Overlay(const SecurityPolicy& base, const SecurityPolicy& over) {
    SecurityPolicy out = base;
    Lay(out.allowPromiscuous, over.allowPromiscuous);
    Lay(out.allowMacChange, over.allowMacChange);
    Lay(out.allowForgedTransmits, over.allowForgedTransmits);
    return out;
}

ShapingPolicy Overlay(const ShapingPolicy& base, const ShapingPolicy& over) {
    ShapingPolicy out = base;
    Lay(out.enabled, over.enabled);
    Lay(out.averageBps, over.averageBps);
    Lay(out.peakBps, over.peakBps);
    Lay(out.burstSize, over.burstSize);
    return out;
}

Capabilities Overlay(const Capabilities& base, const Capabilities& over) {
    Capabilities out = base;
    Lay(out.csumOffload, over.csumOffload);
    Lay(out.tcpSegmentation, over.tcpSegmentation);
    Lay(out.zeroCopyXmit, over.zeroCopyXmit);
    return out;
}

Capabilities LoadCapabilities(const In& in) {
    Capabilities c;
    c.csumOffload = in.OptBool("csumOffload");
    c.tcpSegmentation = in.OptBool("tcpSegmentation");
    c.zeroCopyXmit = in.OptBool("zeroCopyXmit");
    in.Done();
    return c;
}

Node SaveCapabilities(const Capabilities& c) {
    Node out = Node::object();
    Put(out, "csumOffload", c.csumOffload);
    Put(out, "tcpSegmentation", c.tcpSegmentation);
    Put(out, "zeroCopyXmit", c.zeroCopyXmit);
    return out;
}

Node SavePolicy(const Policy& p) {
    Node teaming = Node::object();
    Put(teaming, "policy", p.teaming.policy);
    Put(teaming, "notifySwitches", p.teaming.notifySwitches);
    Put(teaming, "rollingRestoration", p.teaming.rollingRestoration);
    if (p.teaming.linkCriteria) {
        Node criteria = Node::object();
        Put(criteria, "beacon", p.teaming.linkCriteria->beacon);
        Json::Append(teaming, "linkCriteria", std::move(criteria));
    }
    Put(teaming, "uplinkOrder", p.teaming.uplinkOrder);
    Put(teaming, "maxActive", p.teaming.maxActive);
    Node security = Node::object();
    Put(security, "allowPromiscuous", p.security.allowPromiscuous);
    Put(security, "allowMacChange", p.security.allowMacChange);
    Put(security, "allowForgedTransmits", p.security.allowForgedTransmits);
    Node shaping = Node::object();
    Put(shaping, "enabled", p.shaping.enabled);
    Put(shaping, "averageBps", p.shaping.averageBps);
    Put(shaping, "peakBps", p.shaping.peakBps);
    Put(shaping, "burstSize", p.shaping.burstSize);
    Node out = Node::object();
    Json::Append(out, "teaming", std::move(teaming));
    Json::Append(out, "security", std::move(security));
    Json::Append(out, "shaping", std::move(shaping));
    return out;
}

}  // namespace TknCtl::Model
