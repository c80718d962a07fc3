#include "completion.h"

#include <cctype>
#include <map>
#include <vector>

#include "zorbel/formatter.h"

namespace Zorbel::Completion {

using AutoCli::Command;
using AutoCli::NamespaceNode;

namespace {

// Options whose values are names of things on the host, and the list command (with the field)
// that gives those names. A source whose command is not registered, or whose result lacks
// the field, is left out.
struct NameSource {
    const char* kind;
    const char* path;
    const char* field;
};
constexpr NameSource kSources[] = {
    {"nic", "network nic list", "Name"},
    {"vswitch", "network vswitch standard list", "Name"},
    {"portgroup", "network vswitch standard portgroup list", "Name"},
    {"interface", "network ip interface list", "Name"},
    {"netstack", "network ip netstack list", "Key"},
    {"ruleset", "network firewall ruleset list", "Name"},
    {"dvs", "network vswitch dvs talvex list", "Name"},
};
constexpr std::pair<const char*, const char*> kNameOptions[] = {
    {"nic-name", "nic"},
    {"vmnic", "nic"},
    {"uplink-name", "nic"},
    {"vswitch-name", "vswitch"},
    {"portgroup-name", "portgroup"},
    {"interface-name", "interface"},
    {"netstack", "netstack"},
    {"ruleset-id", "ruleset"},
    {"dvs-name", "dvs"},
};

// Text in single quotes for either shell.
std::string Quote(const std::string& text) {
    std::string out = "'";
    for (char c : text) {
        if (c == '\'') {
            out += "'\\''";
        } else {
            out += c;
        }
    }
    return out + "'";
}

std::string JoinLines(const std::vector<std::string>& items) {
    std::string text;
    for (std::size_t i = 0; i < items.size(); ++i)
        text += (i ? "\n" : "") + items[i];
    return text;
}

// Everything the scripts need to know, as associative arrays keyed by paths.
struct Tables {
    std::map<std::string, std::string> children;  // namespace path ("." for the root) -> words
    std::map<std::string, std::string> commands;  // command path -> its long options
    std::map<std::string, std::string> shorts;    // "path -s" -> "--long"
    std::map<std::string, std::string> values;    // "path --long" -> values, "@kind", or "" (free)
    std::map<std::string, std::string> lists;     // "path --long" of options that may be repeated
    std::map<std::string, std::string> sources;   // kind -> "FIELD\nlist command path"
    // zsh shows these beside the candidates: "path" of a namespace or command, "path --long".
    std::map<std::string, std::string> descriptions;
};

// The first line of a description, without edge blanks: what fits beside a candidate.
std::string Summary(const std::string& text) {
    std::size_t start = text.find_first_not_of(" \n");
    if (start == std::string::npos) return {};
    std::size_t end = text.find('\n', start);
    std::string line = text.substr(start, end == std::string::npos ? std::string::npos : end - start);
    while (!line.empty() && line.back() == ' ')
        line.pop_back();
    return Format::TerminalSafe(line);
}

std::shared_ptr<NamespaceNode> Find(NamespaceNode& root, const std::string& path) {
    std::shared_ptr<NamespaceNode> node = root.GetThis();
    std::size_t start = 0;
    while (node && start <= path.size()) {
        std::size_t blank = path.find(' ', start);
        if (blank == std::string::npos) blank = path.size();
        node = node->GetNamespaceNode(path.substr(start, blank - start));
        start = blank + 1;
    }
    return node;
}

void Walk(const std::shared_ptr<NamespaceNode>& node, const std::string& path, Tables& tables,
          const std::map<std::string, std::string>& kinds) {
    std::vector<std::string> names;
    for (const auto& name : node->GetNamespaceNodeNames()) {
        auto child = node->GetNamespaceNode(name);
        if (!child) continue;
        names.push_back(name);
        std::string childPath = path.empty() ? name : path + " " + name;
        tables.descriptions[childPath] = Summary(child->GetDescription());
        if (child->GetType() != AutoCli::NODE_COMMAND) {
            Walk(child, childPath, tables, kinds);
            continue;
        }
        auto command = std::dynamic_pointer_cast<Command>(child);
        auto input = command ? command->GetInputSpec() : nullptr;
        std::vector<std::string> options;
        if (input) {
            for (const auto& parameter : input->GetParameters()) {
                std::string longName = "--" + parameter->GetName();
                options.push_back(longName);
                std::string key = childPath + " " + longName;
                tables.descriptions[key] = Summary(parameter->GetDescription());
                if (!parameter->GetShortName().empty())
                    tables.shorts[childPath + " -" + parameter->GetShortName()] = longName;
                if (parameter->GetType() == CallSpec::PARAM_STRING_LIST) tables.lists[key] = "1";
                if (parameter->GetType() == CallSpec::PARAM_FLAG) continue;
                std::vector<std::string> values;
                if (parameter->GetType() == CallSpec::PARAM_BOOL) values = {"true", "false"};
                if (const auto& constraint = parameter->GetConstraint()) {
                    for (const auto& entry : constraint->GetStringEnum())
                        values.push_back(entry.value);
                    for (long value : constraint->GetIntEnum())
                        values.push_back(std::to_string(value));
                }
                std::string text = JoinLines(values);
                if (values.empty()) {
                    auto kind = kinds.find(parameter->GetName());
                    if (kind != kinds.end()) text = "@" + kind->second;
                }
                tables.values[key] = text;
            }
        }
        tables.commands[childPath] = JoinLines(options);
    }
    tables.children[path.empty() ? "." : path] = JoinLines(names);
}

Tables Collect(NamespaceNode& root) {
    Tables tables;
    std::map<std::string, std::string> kinds;
    for (const auto& source : kSources) {
        auto command = std::dynamic_pointer_cast<Command>(Find(root, source.path));
        if (!command) continue;
        auto output = command->GetOutputSpec();
        Format::OutputParameters fields;
        fields.Set("fields", source.field);
        if (!output || !output->GetRootObject() ||
            !Format::CheckFields(fields, output->GetRootObject().get()).empty())
            continue;
        tables.sources[source.kind] = std::string(source.field) + "\n" + source.path;
    }
    for (const auto& [option, kind] : kNameOptions) {
        if (tables.sources.count(kind)) kinds[option] = kind;
    }
    Walk(root.GetThis(), "", tables, kinds);
    return tables;
}

std::string Array(const std::string& declare, const std::string& name,
                  const std::map<std::string, std::string>& map) {
    std::string out = declare + " " + name + "\n" + name + "=(\n";
    for (const auto& [key, value] : map)
        out += "    [" + Quote(key) + "]=" + Quote(value) + "\n";
    return out + ")\n";
}

std::string Identifier(const std::string& program) {
    std::string id;
    for (char c : program)
        id += (std::isalnum(static_cast<unsigned char>(c)) || c == '_') ? c : '_';
    return id;
}

void ReplaceAll(std::string& text, const std::string& from, const std::string& to) {
    std::size_t pos = 0;
    while ((pos = text.find(from, pos)) != std::string::npos) {
        text.replace(pos, from.size(), to);
        pos += to.size();
    }
}

std::string Data(const Tables& tables, const std::string& declare, const std::string& id) {
    std::string out;
    out += Array(declare, "_" + id + "_children", tables.children);
    out += Array(declare, "_" + id + "_commands", tables.commands);
    out += Array(declare, "_" + id + "_shorts", tables.shorts);
    out += Array(declare, "_" + id + "_values", tables.values);
    out += Array(declare, "_" + id + "_lists", tables.lists);
    out += Array(declare, "_" + id + "_sources", tables.sources);
    if (declare == "typeset -gA") out += Array(declare, "_" + id + "_descriptions", tables.descriptions);
    std::string formatters;
    for (const auto& name : Format::FormatterNames())
        formatters += (formatters.empty() ? "" : "\n") + name;
    out += "_" + id + "_formatters=" + Quote(formatters) + "\n";
    return out;
}

// The walk over the words of the line is the same in both shells; these are its bash and zsh
// forms. @ID@ is the program name as an identifier, @PROG@ the program.
const char* const kBash = R"BASH(
# The global options that take a value, given as the next word or after '='.
_@ID@_global_options=$'--formatter\n--format-param\n--backend\n--state\n--plugin-dir\n--batch\n--atomic\n--dry-run\n--confirm-within\n--confirm\n--rollback\n--list-commands\n--manual\n--completion\n--help\n--version'

# Adds the candidates that start with the typed text ($2) to COMPREPLY, after $1 (the part of
# the word readline replaces ahead of the value). Names with blanks or quotes are escaped
# unless the word was opened with a quote.
_@ID@_add() {
    local before=$1 typed=$2 quote="" candidate escaped
    shift 2
    if [[ $typed == [\"\']* ]]; then
        quote=${typed:0:1}
        typed=${typed:1}
    fi
    for candidate in "$@"; do
        [[ -n $candidate && $candidate == "$typed"* ]] || continue
        if [[ -n $quote ]]; then
            COMPREPLY+=("$before$candidate")
        else
            printf -v escaped '%q' "$candidate"
            COMPREPLY+=("$before$escaped")
        fi
    done
}

# The names of one kind from the host, asked of the program with the global options of the
# line (--backend, --state, --plugin-dir): one keyvalue line per name, escapes undone.
_@ID@_names() {
    local source=${_@ID@_sources[$1]} line name program=${COMP_WORDS[0]}
    _@ID@_found=()
    [[ -n $source ]] || return 0
    local field=${source%%$'\n'*} path=${source#*$'\n'}
    [[ $program == */* && -x $program ]] || program=@PROG@
    local -a command_words
    read -r -a command_words <<< "$path"
    while IFS= read -r line; do
        [[ $line == *=* ]] || continue
        printf -v name '%b' "${line#*=}"
        _@ID@_found+=("$name")
    done < <("$program" "${_@ID@_globals[@]}" --formatter=keyvalue "--format-param=fields=$field" \
        "${command_words[@]}" 2>/dev/null </dev/null)
}

_@ID@_global_value() {
    local option=$1 before=$2 typed=$3
    local -a candidates=()
    case $option in
        --formatter) mapfile -t candidates <<< "$_@ID@_formatters" ;;
        --completion) candidates=(bash zsh) ;;
        --backend) candidates=(simulated linux) ;;
        --manual) candidates=(man markdown) ;;
        --format-param) candidates=(fields= show-header=false show-header=true) ;;
        --state|--batch) mapfile -t candidates < <(compgen -f -- "$typed") ;;
        --plugin-dir) mapfile -t candidates < <(compgen -d -- "$typed") ;;
    esac
    _@ID@_add "$before" "$typed" "${candidates[@]}"
}

_@ID@_value() {
    local node=$1 option=$2 before=$3 typed=$4
    [[ $option == --* ]] || option=${_@ID@_shorts["$node $option"]}
    [[ -n $option ]] || return 0
    local values=${_@ID@_values["$node $option"]}
    [[ -n $values ]] || return 0
    local -a candidates=()
    if [[ $values == @* ]]; then
        _@ID@_names "${values#@}"
        candidates=("${_@ID@_found[@]}")
    else
        mapfile -t candidates <<< "$values"
    fi
    _@ID@_add "$before" "$typed" "${candidates[@]}"
}

_@ID@() {
    COMPREPLY=()
    # Readline splits words at '='; put "--option=value" back together.
    local -a words=()
    local k token join=0
    for ((k = 0; k <= COMP_CWORD; k++)); do
        token=${COMP_WORDS[k]}
        if ((${#words[@]} > 0)) && [[ $token == "=" || $join == 1 ]]; then
            words[${#words[@]} - 1]+=$token
            [[ $token == "=" ]] && join=1 || join=0
        else
            words+=("$token")
            join=0
        fi
    done
    local n=$((${#words[@]} - 1)) i=1 w
    local cur=${words[n]}
    # When the word was split, readline replaces only what follows the '='.
    local split=0
    [[ $cur != "${COMP_WORDS[COMP_CWORD]}" ]] && split=1
    local before

    _@ID@_globals=()
    while ((i < n)); do
        w=${words[i]}
        case $w in
            --state|--plugin-dir|--backend) _@ID@_globals+=("$w=${words[i + 1]}"); i=$((i + 2)); continue ;;
            --formatter|--format-param|--completion|--batch|--confirm-within) i=$((i + 2)); continue ;;
            --state=*|--plugin-dir=*|--backend=*) _@ID@_globals+=("$w") ;;
            -*) ;;
            *) break ;;
        esac
        i=$((i + 1))
    done
    if ((i > n)); then
        _@ID@_global_value "${words[n - 1]}" "" "$cur"
        return 0
    fi
    if ((i == n)); then
        if [[ $cur == --*=* ]]; then
            before="${cur%%=*}="
            ((split)) && before=""
            _@ID@_global_value "${cur%%=*}" "$before" "${cur#*=}"
        elif [[ $cur == -* ]]; then
            local -a options
            mapfile -t options <<< "$_@ID@_global_options"
            _@ID@_add "" "$cur" "${options[@]}"
        else
            local -a names
            mapfile -t names <<< "${_@ID@_children[.]}"
            _@ID@_add "" "$cur" "${names[@]}"
        fi
        return 0
    fi

    # Namespaces down to a command.
    local node="" key
    while ((i < n)); do
        w=${words[i]}
        [[ $w == -* ]] && break
        key=${node:+$node }$w
        if [[ -n ${_@ID@_children[$key]+set} ]]; then
            node=$key
        elif [[ -n ${_@ID@_commands[$key]+set} ]]; then
            node=$key
            i=$((i + 1))
            break
        else
            return 0
        fi
        i=$((i + 1))
    done
    if [[ -z ${_@ID@_commands[$node]+set} ]]; then
        if ((i == n)); then
            if [[ $cur == -* ]]; then
                _@ID@_add "" "$cur" --help
            else
                local -a names
                mapfile -t names <<< "${_@ID@_children[${node:-.}]}"
                _@ID@_add "" "$cur" "${names[@]}"
            fi
        fi
        return 0
    fi

    # The command's options: those given so far, and whether the word at the cursor is a value.
    local -a given=()
    local long
    while ((i < n)); do
        w=${words[i]}
        if [[ $w == -* ]]; then
            long=${w%%=*}
            [[ $long == --* ]] || long=${_@ID@_shorts["$node $long"]}
            given+=("$long")
            if [[ $w != *=* && -n $long && -n ${_@ID@_values["$node $long"]+set} ]]; then
                i=$((i + 1))
            fi
        fi
        i=$((i + 1))
    done
    if ((i > n)); then
        _@ID@_value "$node" "${words[n - 1]}" "" "$cur"
        return 0
    fi
    if [[ $cur == -*=* ]]; then
        before="${cur%%=*}="
        ((split)) && before=""
        _@ID@_value "$node" "${cur%%=*}" "$before" "${cur#*=}"
        return 0
    fi
    [[ -z $cur || $cur == -* ]] || return 0
    local -a candidates=()
    local option seen g
    while IFS= read -r option; do
        [[ -n $option ]] || continue
        seen=0
        if [[ -z ${_@ID@_lists["$node $option"]+set} ]]; then
            for g in "${given[@]}"; do [[ $g == "$option" ]] && seen=1; done
        fi
        ((seen)) || candidates+=("$option")
    done <<< "${_@ID@_commands[$node]}"
    _@ID@_add "" "$cur" "${candidates[@]}"
    return 0
}
complete -F _@ID@ @PROG@
)BASH";

const char* const kZsh = R"ZSH(
_@ID@_global_options=$'--formatter\n--format-param\n--backend\n--state\n--plugin-dir\n--batch\n--atomic\n--dry-run\n--confirm-within\n--confirm\n--rollback\n--list-commands\n--manual\n--completion\n--help\n--version'

# The names of one kind from the host, asked of the program with the global options of the
# line (--backend, --state, --plugin-dir): one keyvalue line per name, escapes undone.
_@ID@_names() {
    local source=${_@ID@_sources[$1]} line name program=${words[1]}
    reply=()
    [[ -n $source ]] || return 0
    local field=${source%%$'\n'*} path=${source#*$'\n'}
    [[ $program == */* && -x $program ]] || program=@PROG@
    local output
    output=$("$program" "${_@ID@_globals[@]}" --formatter=keyvalue "--format-param=fields=$field" \
        ${=path} 2>/dev/null </dev/null)
    for line in "${(@f)output}"; do
        [[ $line == *=* ]] || continue
        printf -v name '%b' "${line#*=}"
        reply+=("$name")
    done
}

# Adds candidates with their descriptions beside them: $1 is the path they hang under.
_@ID@_described() {
    local node=$1 candidate description
    shift
    local -a shown
    for candidate in "$@"; do
        description=${_@ID@_descriptions[${node:+$node }$candidate]}
        shown+=("$candidate${description:+  -- $description}")
    done
    compadd -l -d shown -- "$@"
}

_@ID@_global_value() {
    case $1 in
        --formatter) compadd -- "${(@f)_@ID@_formatters}" ;;
        --completion) compadd -- bash zsh ;;
        --backend) compadd -- simulated linux ;;
        --manual) compadd -- man markdown ;;
        --format-param) compadd -S '' -- fields= show-header=false show-header=true ;;
        --state|--batch) _files ;;
        --plugin-dir) _files -/ ;;
    esac
}

_@ID@_value() {
    local node=$1 option=$2
    [[ $option == --* ]] || option=${_@ID@_shorts[$node $option]}
    [[ -n $option ]] || return 0
    local values=${_@ID@_values[$node $option]}
    [[ -n $values ]] || return 0
    if [[ $values == @* ]]; then
        local -a reply
        _@ID@_names "${values#@}"
        compadd -- "${reply[@]}"
    else
        compadd -- "${(@f)values}"
    fi
}

_@ID@() {
    local n=$CURRENT i=2 w cur=${words[CURRENT]}
    _@ID@_globals=()
    while ((i < n)); do
        w=${words[i]}
        case $w in
            --state|--plugin-dir|--backend) _@ID@_globals+=("$w=${words[i + 1]}"); i=$((i + 2)); continue ;;
            --formatter|--format-param|--completion|--batch|--confirm-within) i=$((i + 2)); continue ;;
            --state=*|--plugin-dir=*|--backend=*) _@ID@_globals+=("$w") ;;
            -*) ;;
            *) break ;;
        esac
        i=$((i + 1))
    done
    if ((i > n)); then
        _@ID@_global_value "${words[n - 1]}"
        return 0
    fi
    if ((i == n)); then
        if [[ $cur == --*=* ]]; then
            local option=${cur%%=*}
            compset -P '*='
            _@ID@_global_value "$option"
        elif [[ $cur == -* ]]; then
            compadd -- "${(@f)_@ID@_global_options}"
        else
            _@ID@_described "" "${(@f)_@ID@_children[.]}"
        fi
        return 0
    fi

    local node="" key
    while ((i < n)); do
        w=${words[i]}
        [[ $w == -* ]] && break
        key=${node:+$node }$w
        if ((${+_@ID@_children[$key]})); then
            node=$key
        elif ((${+_@ID@_commands[$key]})); then
            node=$key
            i=$((i + 1))
            break
        else
            return 1
        fi
        i=$((i + 1))
    done
    if ! ((${+_@ID@_commands[$node]})); then
        if ((i == n)); then
            if [[ $cur == -* ]]; then
                compadd -- --help
            else
                _@ID@_described "$node" "${(@f)_@ID@_children[${node:-.}]}"
            fi
        fi
        return 0
    fi

    local -a given
    local long
    while ((i < n)); do
        w=${words[i]}
        if [[ $w == -* ]]; then
            long=${w%%=*}
            [[ $long == --* ]] || long=${_@ID@_shorts[$node $long]}
            given+=("$long")
            if [[ $w != *=* && -n $long ]] && ((${+_@ID@_values[$node $long]})); then
                i=$((i + 1))
            fi
        fi
        i=$((i + 1))
    done
    if ((i > n)); then
        _@ID@_value "$node" "${words[n - 1]}"
        return 0
    fi
    if [[ $cur == -*=* ]]; then
        local option=${cur%%=*}
        compset -P '*='
        _@ID@_value "$node" "$option"
        return 0
    fi
    local -a candidates
    local option
    for option in "${(@f)_@ID@_commands[$node]}"; do
        [[ -n $option ]] || continue
        if ! ((${+_@ID@_lists[$node $option]})) && ((${given[(Ie)$option]})); then
            continue
        fi
        candidates+=("$option")
    done
    _@ID@_described "$node" "${candidates[@]}"
}

if [[ ${zsh_eval_context[-1]} == loadautofunc ]]; then
    _@ID@ "$@"
else
    compdef _@ID@ @PROG@
fi
)ZSH";

}  // namespace

std::string Script(const std::string& shell, const std::string& program, NamespaceNode& root) {
    const std::string id = Identifier(program);
    Tables tables = Collect(root);
    std::string out;
    std::string body;
    if (shell == "zsh") {
        out = "#compdef " + program + "\n# zsh completion for " + program + "; written by '" + program +
              " --completion zsh' from the registered commands.\n";
        out += Data(tables, "typeset -gA", id);
        body = kZsh;
    } else {
        out = "# bash completion for " + program + "; written by '" + program +
              " --completion bash' from the registered commands.\n";
        out += Data(tables, "declare -gA", id);
        body = kBash;
    }
    ReplaceAll(body, "@ID@", id);
    ReplaceAll(body, "@PROG@", program);
    return out + body;
}

}  // namespace Zorbel::Completion
