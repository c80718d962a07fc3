#include "core/hook.h"

#include "backend/host.h"
#include "core/section.h"
#include "hostctl/exception.h"
#include "model/faults.h"
#include "model/journal.h"

namespace TknCtl::Lib {

std::optional<std::string> TryEnter(std::string_view operation, std::string_view target,
                                    std::string_view arguments) {
    RequireSession();
    auto line = [&] {
        std::string text(operation);
        for (std::string_view part : {target, arguments}) {
            if (part.empty()) continue;
            text += ' ';
            text += part;
        }
        return text;
    };
    // A dry run lists the calls on either host, and leaves the journal as it is.
    const bool dryRun = DryRun();
    if (dryRun) RecordDryRun(line());
    // Faults and the journal belong to the simulated host's state file.
    if (RealHost()) return std::nullopt;

    if (!dryRun && Read<Model::JournalSection>().enabled)
        Write<Model::JournalSection>().lines.push_back(line());

    const auto& faults = Read<Model::FaultsSection>().faults;
    for (std::size_t i = 0; i < faults.size(); ++i) {
        const auto& fault = faults[i];
        if (fault.operation != operation || (!fault.target.empty() && fault.target != target)) continue;
        std::string message =
            fault.message.empty() ? "Simulated failure in " + std::string(operation) : fault.message;
        if (fault.count) {
            auto& table = Write<Model::FaultsSection>().faults;
            if (--*table[i].count == 0) table.erase(table.begin() + static_cast<std::ptrdiff_t>(i));
        }
        return message;
    }
    return std::nullopt;
}

void Enter(std::string_view operation, std::string_view target, std::string_view arguments) {
    if (auto fault = TryEnter(operation, target, arguments)) throw HostCtl::Lib::HostCtlException(*fault);
}

}  // namespace TknCtl::Lib
