// Physical NICs: netqueue load balancer, queue counts, filter classes and plugins.
#include <algorithm>

#include "backend/nics.h"
#include "core/hook.h"
#include "core/section.h"
#include "hostctl/exception.h"
#include "hostctl/network/nic.h"
#include "model/pnics.h"

namespace TknCtl::Network {

using HostCtl::Lib::HostCtlException;
namespace Net = HostCtl::Network;

namespace {

const Model::Pnic& Enter(const char* operation, const std::string& name, const std::string& arguments = {}) {
    Lib::Enter(std::string("HostCtl::Network::Pnic::") + operation, name, arguments);
    const auto& nic = Model::ReadPnic(name);
    if (!Model::Supports(nic, "netqueue"))
        throw HostCtlException(name + " does not support netqueue (driver " + nic.driver.name + ")");
    return nic;
}

// The real host's NICs, when the session manages one.
Backend::Nics* Real(const char* operation, const std::string& name) {
    return Backend::EnterRealNics(std::string("HostCtl::Network::Pnic::") + operation, name);
}

// Features the device itself has no say in: the load balancer may always allow them.
bool DeviceIndependent(std::size_t feature) {
    return feature == 1 || feature == 4 || feature == 6;  // RxQNoFeature, RxDynamicLB, MacLearnLB
}

void CheckCount(const char* direction, std::uint32_t count, std::uint32_t maximum, const std::string& name) {
    if (count == 0 || (maximum != 0 && count > maximum)) {
        throw HostCtlException(std::string(direction) + " netqueue count " + std::to_string(count) +
                               " is out of range for " + name + " (1 to " +
                               (maximum != 0 ? std::to_string(maximum) : std::string("4294967295")) + ")");
    }
}

std::string Arguments(const Net::PnicNetqueueInfo& info) {
    std::string out;
    auto add = [&out](const std::string& text) { out += (out.empty() ? "" : " ") + text; };
    if (info.lbMask != 0) {
        std::string allowed;
        for (std::size_t i = 0; i < Model::kLbFeatureCount; ++i) {
            if (info.lbMask & (1u << i))
                allowed += (allowed.empty() ? "" : ",") + std::string(Model::kLbFeatureNames[i]) + "=" +
                           (info.lbAllowed[i] ? "true" : "false");
        }
        add("lb=" + allowed);
    }
    if (info.setTxCount) add("tx=" + std::to_string(info.txQueueCount));
    if (info.setRxCount) add("rx=" + std::to_string(info.rxQueueCount));
    if (info.stateChanged) add(std::string("balancer=") + (info.balancerEnabled ? "true" : "false"));
    if (info.pluginChanged) {
        for (const auto& plugin : info.plugins)
            add("plugin=" + plugin.moduleName + "/" + plugin.pluginName);
        add(std::string("enabled=") + (info.pluginEnabled ? "true" : "false"));
    }
    return out;
}

}  // namespace

void PnicImpl::GetNetqueueInfo(Net::PnicNetqueueInfo& info) const {
    if (auto* nics = Real("GetNetqueueInfo", name_)) return nics->GetNetqueueInfo(name_, info);
    const auto& q = Enter("GetNetqueueInfo", name_).netqueue;
    info = Net::PnicNetqueueInfo();
    info.txQueueCount = q.txQueues;
    info.rxQueueCount = q.rxQueues;
    info.balancerEnabled = q.balancerEnabled;
    for (std::size_t i = 0; i < Model::kLbFeatureCount; ++i) {
        info.lbSupported[i] = q.features[i].supported;
        info.lbAllowed[i] = q.features[i].allowed;
    }
    info.filterMacOnly = q.filterClasses.macOnly;
    info.filterVlanOnly = q.filterClasses.vlanOnly;
    info.filterVlanMac = q.filterClasses.vlanMac;
    info.filterVxlan = q.filterClasses.vxlan;
    info.filterGeneve = q.filterClasses.geneve;
    info.filterGenericEncap = q.filterClasses.genericEncap;
    for (const auto& plugin : q.plugins) {
        info.plugins.push_back({plugin.module, plugin.plugin, plugin.description});
        if (plugin.enabled) info.enabledPlugins.push_back({plugin.module, plugin.plugin, plugin.description});
    }
}

void PnicImpl::SetNetqueueInfo(const Net::PnicNetqueueInfo& info) {
    if (auto* nics = Real("SetNetqueueInfo", name_)) return nics->SetNetqueueInfo(name_, info);
    const auto& q = Enter("SetNetqueueInfo", name_, Arguments(info)).netqueue;
    // Check the whole request before anything changes.
    if (info.lbMask & ~((1u << Model::kLbFeatureCount) - 1)) {
        throw HostCtlException("Unknown netqueue load balancer mask bits " +
                               std::to_string(info.lbMask & ~((1u << Model::kLbFeatureCount) - 1)));
    }
    for (std::size_t i = 0; i < Model::kLbFeatureCount; ++i) {
        if ((info.lbMask & (1u << i)) && info.lbAllowed[i] && !q.features[i].supported &&
            !DeviceIndependent(i)) {
            throw HostCtlException(name_ + " does not support the netqueue load balancer feature " +
                                   Model::kLbFeatureNames[i]);
        }
    }
    if (info.setTxCount) CheckCount("TX", info.txQueueCount, q.maxTxQueues, name_);
    if (info.setRxCount) CheckCount("RX", info.rxQueueCount, q.maxRxQueues, name_);
    if (info.pluginChanged) {
        if (info.plugins.empty()) throw HostCtlException("No netqueue balancer plugin given");
        for (const auto& wanted : info.plugins) {
            if (std::none_of(q.plugins.begin(), q.plugins.end(), [&](const Model::NetqueuePlugin& p) {
                    return p.module == wanted.moduleName && p.plugin == wanted.pluginName;
                })) {
                throw HostCtlException(name_ + " has no netqueue balancer plugin " + wanted.pluginName +
                                       " in module " + wanted.moduleName);
            }
        }
    }

    auto& netqueue = Model::WritePnic(name_).netqueue;
    for (std::size_t i = 0; i < Model::kLbFeatureCount; ++i) {
        if (info.lbMask & (1u << i)) netqueue.features[i].allowed = info.lbAllowed[i];
    }
    if (info.setTxCount) netqueue.txQueues = info.txQueueCount;
    if (info.setRxCount) netqueue.rxQueues = info.rxQueueCount;
    if (info.stateChanged) netqueue.balancerEnabled = info.balancerEnabled;
    if (info.pluginChanged) {
        for (auto& plugin : netqueue.plugins) {
            for (const auto& wanted : info.plugins) {
                if (plugin.module == wanted.moduleName && plugin.plugin == wanted.pluginName)
                    plugin.enabled = info.pluginEnabled;
            }
        }
    }
}

}  // namespace TknCtl::Network
