#include "zorbel/autocli.h"

#include "zorbel/dispatcher.h"

namespace Zorbel::AutoCli {

NamespaceNode::~NamespaceNode() = default;

std::shared_ptr<NamespaceNode> NamespaceNode::GetThis() {
    return shared_from_this();
}

NodeType NamespaceNode::GetType() const {
    return NODE_NAMESPACE;
}

std::list<std::string> NamespaceNode::GetPath() {
    std::list<std::string> path;
    std::shared_ptr<NamespaceNode> node = GetThis();
    while (node) {
        auto parent = node->GetParent();
        if (!parent) break;  // the root has no name of its own
        path.push_front(node->name_);
        node = parent;
    }
    return path;
}

std::string NamespaceNode::GetPathString(char separator) {
    std::string text;
    for (const auto& word : GetPath()) {
        if (!text.empty()) text += separator;
        text += word;
    }
    return text;
}

bool NamespaceNode::HasNamespaceNode(const std::string& name) {
    return GetNamespaceNode(name) != nullptr;
}

std::vector<std::string> NamespaceNode::GetNamespaceNodeNames() {
    std::vector<std::string> names;
    names.reserve(children_.size());
    for (const auto& child : children_)
        names.push_back(child.first);
    return names;
}

std::vector<std::shared_ptr<NamespaceNode>> NamespaceNode::GetNamespaceNodes() {
    std::vector<std::shared_ptr<NamespaceNode>> nodes;
    nodes.reserve(children_.size());
    for (const auto& child : children_)
        nodes.push_back(child.second);
    return nodes;
}

std::shared_ptr<NamespaceNode> NamespaceNode::GetNamespaceNode(const std::string& name) {
    for (const auto& child : children_) {
        if (child.first == name) return child.second;
    }
    return nullptr;
}

void NamespaceNode::RegisterNamespaceNode(std::shared_ptr<NamespaceNode> child, std::string name) {
    if (!child) return;
    child->name_ = name;
    child->SetParent(GetThis());
    for (auto& entry : children_) {
        if (entry.first == name) {
            entry.second = std::move(child);
            return;
        }
    }
    children_.emplace_back(std::move(name), std::move(child));
}

void NamespaceNode::RegisterNamespaceNode(std::shared_ptr<NamespaceNode> child, const char* name) {
    RegisterNamespaceNode(std::move(child), std::string(name ? name : ""));
}

std::shared_ptr<NamespaceNode> NamespaceNode::ResolveNode(std::list<std::string>& path) {
    std::shared_ptr<NamespaceNode> node = GetThis();
    while (!path.empty()) {
        auto child = node->GetNamespaceNode(path.front());
        if (!child) break;
        path.pop_front();
        node = child;
        if (node->GetType() == NODE_COMMAND) break;
    }
    return node;
}

std::shared_ptr<NamespaceNode> NamespaceNode::SubNamespace(const std::string& name) {
    auto child = GetNamespaceNode(name);
    if (child) return child;
    child = Namespace::New();
    RegisterNamespaceNode(child, name);
    return child;
}

std::shared_ptr<Dispatcher> NamespaceNode::GetDispatcher() {
    if (auto dispatcher = dispatcher_.lock()) return dispatcher;
    auto parent = GetParent();
    return parent ? parent->GetDispatcher() : nullptr;
}

void NamespaceNode::SetParent(std::shared_ptr<NamespaceNode> parent) {
    parent_ = parent;
}

std::shared_ptr<NamespaceNode> NamespaceNode::GetParent() {
    return parent_.lock();
}

void NamespaceNode::SetDescription(const char* description) {
    description_ = description ? description : "";
}
void NamespaceNode::SetDescription(std::string description) {
    description_ = std::move(description);
}

std::shared_ptr<Namespace> Namespace::New() {
    return std::make_shared<Namespace>();
}

NodeType CommandSpec::GetType() const {
    return NODE_COMMAND;
}

void CommandSpec::SetMetaDataField(const std::string& key, const std::string& value) {
    for (auto& entry : metadata_) {
        if (entry.first == key) {
            entry.second = value;
            return;
        }
    }
    metadata_.emplace_back(key, value);
}

std::string CommandSpec::GetMetaDataField(const std::string& key) const {
    for (const auto& entry : metadata_) {
        if (entry.first == key) return entry.second;
    }
    return {};
}

void CommandSpec::SetDefaultOutputFormatter(const std::string& name) {
    formatter_ = name;
}

void CommandSpec::SetDefaultOutputParameter(const std::string& key, const std::string& value) {
    for (auto& entry : outputParameters_) {
        if (entry.first == key) {
            entry.second = value;
            return;
        }
    }
    outputParameters_.emplace_back(key, value);
}

Command::Command() = default;
Command::~Command() = default;

std::shared_ptr<CallSpec::InputSpec> Command::GetInputSpec() {
    return GetInputSpecInternal();
}
std::shared_ptr<CallSpec::OutputSpec> Command::GetOutputSpec() {
    return GetOutputSpecInternal();
}
std::shared_ptr<NamespaceNode> Command::GetThis() {
    return NamespaceNode::GetThis();
}
NodeType Command::GetType() const {
    return NODE_COMMAND;
}

void Command::Execute(std::shared_ptr<CallSpec::Input> input, std::shared_ptr<CallSpec::Output> output) {
    ExecuteInternal(std::move(input), std::move(output));
}

}  // namespace Zorbel::AutoCli
