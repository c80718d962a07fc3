// The shape of the "network" tree as the plug-in registers it.
#include <gtest/gtest.h>

#include <algorithm>
#include <functional>
#include <set>
#include <sstream>
#include <typeinfo>

#include "zorbel/dispatcher.h"

namespace {

using Zorbel::AutoCli::Dispatcher;
using Zorbel::AutoCli::NamespaceNode;

std::shared_ptr<NamespaceNode> Network() {
    static std::shared_ptr<Dispatcher> dispatcher = [] {
        auto d = Dispatcher::New();
        std::ostringstream err;
        d->LoadPluginDirectories({HADRO_PLUGIN_DIR}, err);
        EXPECT_EQ(err.str(), "");
        return d;
    }();
    return dispatcher->GetRoot()->GetNamespaceNode("network");
}

std::shared_ptr<NamespaceNode> Resolve(const std::string& path) {
    std::list<std::string> words;
    std::istringstream in(path);
    for (std::string word; in >> word;)
        words.push_back(word);
    words.pop_front();  // "network"
    auto node = Network()->ResolveNode(words);
    return words.empty() ? node : nullptr;
}

}  // namespace

TEST(Tree, EightyFourNamespacesEachDescribed) {
    ASSERT_NE(Network(), nullptr);
    int namespaces = 0;
    std::function<void(const std::shared_ptr<NamespaceNode>&)> walk = [&](const auto& node) {
        if (node->GetType() != Zorbel::AutoCli::NODE_NAMESPACE) return;
        ++namespaces;
        EXPECT_FALSE(node->GetDescription().empty()) << node->GetPathString(' ');
        for (const auto& child : node->GetNamespaceNodes())
            walk(child);
    };
    walk(Network());
    EXPECT_EQ(namespaces, 84);
}

TEST(Tree, DescriptionsAndCreationOrder) {
    EXPECT_EQ(
        Network()->GetDescription(),
        "Operations that pertain to the maintenance of networking on an Hadro host. This includes a wide "
        "variety of commands to manipulate virtual networking components (vswitch, portgroup, etc) as well "
        "as local host IP, DNS and general host networking settings.");
    // Namespaces without commands of their own carry their descriptions too.
    const std::pair<const char*, const char*> samples[] = {
        {"network ip dns", "Operations pertaining to Domain Name Server configuration."},
        {"network vswitch", "Commands to list and manipulate Virtual Switches on an Hadro host."},
        {"network nic queue", "Commands to access RX/TX netqueue features on a NIC"},
        {"network port filter", "Commands to get port filter information"},
        {"network nic coalesce", "Commands to access coalesce paramaters for a NIC"},
        {"network vswitch dvs talvex lacp timeout", "Command to set LACP LAG timeout"},
        {"network ens maxLcores", "Commands to access maximum number of ENS contexts."},
        {"network ip interface ipv4 address",
         "Commands for managing IPv4 addresses assigned to Tarkon network interfaces."},
    };
    for (const auto& [path, description] : samples) {
        auto node = Resolve(path);
        ASSERT_NE(node, nullptr) << path;
        EXPECT_EQ(node->GetDescription(), description) << path;
    }

    auto namespaces = [](const std::shared_ptr<NamespaceNode>& node) {
        std::vector<std::string> names;
        for (const auto& name : node->GetNamespaceNodeNames()) {
            if (node->GetNamespaceNode(name)->GetType() == Zorbel::AutoCli::NODE_NAMESPACE)
                names.push_back(name);
        }
        return names;
    };
    EXPECT_EQ(namespaces(Network()), (std::vector<std::string>{"ip", "multicast", "nic", "sriovnic",
                                                               "vswitch", "firewall", "port", "vm", "ens"}));
    EXPECT_EQ(namespaces(Resolve("network ip")),
              (std::vector<std::string>{"neighbor", "connection", "dns", "route", "ipsec", "interface",
                                        "netstack"}));
    EXPECT_EQ(namespaces(Resolve("network vswitch dvs talvex")), (std::vector<std::string>{"lacp"}));
    EXPECT_EQ(namespaces(Resolve("network vswitch dvs talvex lacp")),
              (std::vector<std::string>{"config", "status", "stats", "timeout"}));
}

TEST(Tree, EveryCommandIsRegisteredOnce) {
    int commands = 0;
    std::set<const void*> objects;
    std::function<void(const std::shared_ptr<NamespaceNode>&)> walk = [&](const auto& node) {
        for (const auto& child : node->GetNamespaceNodes()) {
            if (child->GetType() == Zorbel::AutoCli::NODE_COMMAND) {
                ++commands;
                objects.insert(child.get());
                EXPECT_FALSE(child->GetDescription().empty()) << child->GetPathString(' ');
            } else {
                walk(child);
            }
        }
    };
    walk(Network());
    EXPECT_EQ(commands, 143);
    // Each registration has an object of its own, also the class registered twice.
    EXPECT_EQ(objects.size(), 143u);

    // The listing has one line per command, also for descriptions of several lines.
    std::ostringstream listing;
    Zorbel::AutoCli::GlobalOptions options;
    Network()->GetDispatcher()->WriteCommandList(options, listing);
    std::string text = listing.str();
    EXPECT_EQ(std::count(text.begin(), text.end(), '\n'), 143);
    EXPECT_NE(text.find("as follows, S: Setting supported by device U: "), std::string::npos);

    auto get = std::dynamic_pointer_cast<Zorbel::AutoCli::Command>(Resolve("network ip interface ipv4 get"));
    auto list = std::dynamic_pointer_cast<Zorbel::AutoCli::Command>(
        Resolve("network ip interface ipv4 address list"));
    ASSERT_NE(get, nullptr);
    ASSERT_NE(list, nullptr);
    EXPECT_NE(get, list);
    const Zorbel::AutoCli::Command& getCommand = *get;
    const Zorbel::AutoCli::Command& listCommand = *list;
    EXPECT_EQ(typeid(getCommand), typeid(listCommand));
    EXPECT_EQ(get->GetDescription(), list->GetDescription());
    auto a = get->GetInputSpec()->GetParameters();
    auto b = list->GetInputSpec()->GetParameters();
    ASSERT_EQ(a.size(), b.size());
    for (std::size_t i = 0; i < a.size(); ++i)
        EXPECT_TRUE(a[i]->SameAs(*b[i]));
}

TEST(Tree, PluginExportsOnlyTheEntryPoint) {
    // Looked up by name in the loaded plug-in: the entry point is there, internals are not.
    std::string command = "nm -D --defined-only " HADRO_PLUGIN_DIR "/libnetwork.so | awk '{print $3}'";
    FILE* pipe = popen(command.c_str(), "r");
    ASSERT_NE(pipe, nullptr);
    std::string out;
    char buffer[256];
    while (fgets(buffer, sizeof buffer, pipe))
        out += buffer;
    pclose(pipe);
    EXPECT_EQ(out, "AutoCli_RegisterNamespaces\n");
}
