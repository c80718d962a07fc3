// The command tree: namespaces and commands, and what a command tells the framework about
// itself (description, metadata, default formatter and output parameters).
#pragma once

#include <list>
#include <map>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "zorbel/callspec.h"

namespace Zorbel::AutoCli {

class Dispatcher;

enum NodeType : int {
    NODE_NAMESPACE = 0,
    NODE_COMMAND = 1,
};

// A node of the tree. Children are kept in registration order. The node keeps a weak
// reference to itself, so it must be owned by a std::shared_ptr (see GetThis()).
class NamespaceNode : public std::enable_shared_from_this<NamespaceNode> {
public:
    NamespaceNode() = default;
    NamespaceNode(const NamespaceNode&) = delete;
    NamespaceNode& operator=(const NamespaceNode&) = delete;
    virtual ~NamespaceNode();

    virtual std::shared_ptr<NamespaceNode> GetThis();
    virtual NodeType GetType() const;
    // The names from the root's first child down to this node.
    virtual std::list<std::string> GetPath();
    virtual std::string GetPathString(char separator);
    virtual bool HasNamespaceNode(const std::string& name);
    virtual std::vector<std::string> GetNamespaceNodeNames();
    virtual std::vector<std::shared_ptr<NamespaceNode>> GetNamespaceNodes();
    // The child of that name, or null.
    virtual std::shared_ptr<NamespaceNode> GetNamespaceNode(const std::string& name);
    // Attaches child under this node as name, sharing ownership; a child of the same name
    // is replaced in place.
    virtual void RegisterNamespaceNode(std::shared_ptr<NamespaceNode> child, std::string name);
    virtual void RegisterNamespaceNode(std::shared_ptr<NamespaceNode> child, const char* name);
    // Walks down the tree, consuming words from the front of path for as long as they name
    // children; returns the deepest node reached (this node when the first word is unknown).
    virtual std::shared_ptr<NamespaceNode> ResolveNode(std::list<std::string>& path);
    // The child namespace of that name, created when missing.
    virtual std::shared_ptr<NamespaceNode> SubNamespace(const std::string& name);
    // The dispatcher that owns the tree this node hangs in, or null.
    virtual std::shared_ptr<Dispatcher> GetDispatcher();
    virtual void SetParent(std::shared_ptr<NamespaceNode> parent);
    virtual std::shared_ptr<NamespaceNode> GetParent();

    void SetDescription(const char* description);
    void SetDescription(std::string description);
    const std::string& GetDescription() const { return description_; }
    const std::string& GetName() const { return name_; }

protected:
    friend class Dispatcher;

private:
    std::string name_;
    std::string description_;
    std::weak_ptr<NamespaceNode> parent_;
    std::weak_ptr<Dispatcher> dispatcher_;
    std::vector<std::pair<std::string, std::shared_ptr<NamespaceNode>>> children_;
};

// A namespace: a node that holds other namespaces and commands.
class Namespace : public NamespaceNode {
public:
    static std::shared_ptr<Namespace> New();
};

// What the framework knows about a command before it runs it.
class CommandSpec : public NamespaceNode {
public:
    NodeType GetType() const override;

    void SetMetaDataField(const std::string& key, const std::string& value);
    void SetDefaultOutputFormatter(const std::string& name);
    void SetDefaultOutputParameter(const std::string& key, const std::string& value);

    // Metadata in the order first set (a key set again keeps its place).
    const std::vector<std::pair<std::string, std::string>>& GetMetaDataFields() const { return metadata_; }
    std::string GetMetaDataField(const std::string& key) const;
    const std::string& GetDefaultOutputFormatter() const { return formatter_; }
    const std::vector<std::pair<std::string, std::string>>& GetDefaultOutputParameters() const {
        return outputParameters_;
    }

private:
    std::vector<std::pair<std::string, std::string>> metadata_;
    std::string formatter_;
    std::vector<std::pair<std::string, std::string>> outputParameters_;
};

// The base of every command. A command supplies its specifications and ExecuteInternal.
class Command : public CommandSpec, public CallSpec::CallTarget {
public:
    Command();
    ~Command() override;

    virtual std::shared_ptr<CallSpec::InputSpec> GetInputSpec();
    virtual std::shared_ptr<CallSpec::OutputSpec> GetOutputSpec();
    std::shared_ptr<NamespaceNode> GetThis() override;
    NodeType GetType() const override;

    virtual std::shared_ptr<CallSpec::InputSpec> GetInputSpecInternal() = 0;
    virtual std::shared_ptr<CallSpec::OutputSpec> GetOutputSpecInternal() = 0;
    // Runs ExecuteInternal.
    void Execute(std::shared_ptr<CallSpec::Input> input, std::shared_ptr<CallSpec::Output> output) override;
    virtual void ExecuteInternal(std::shared_ptr<CallSpec::Input> input,
                                 std::shared_ptr<CallSpec::Output> output) = 0;
};

}  // namespace Zorbel::AutoCli
