#include "model/faults.h"

#include "core/json_io.h"
#include "core/text.h"

namespace TknCtl::Model {

namespace {

void Load(const Json::In& in, FaultsSection& section) {
    in.Elements([&](const Json::In& item) {
        Fault fault;
        fault.operation = item.Str("operation");
        fault.target = item.Str("target", "");
        fault.message = item.Str("message", "");
        fault.count = item.OptInt<std::uint32_t>("count");
        item.Done();
        section.faults.push_back(std::move(fault));
    });
}

Json::Node Save(const FaultsSection& section) {
    Json::Node out = Json::Node::array();
    for (const auto& fault : section.faults) {
        Json::Node item = {{"operation", fault.operation}};
        if (!fault.target.empty()) item["target"] = fault.target;
        if (!fault.message.empty()) item["message"] = fault.message;
        if (fault.count) item["count"] = *fault.count;
        out.push_back(std::move(item));
    }
    return out;
}

void Check(const FaultsSection& section, Lib::Checker& checker) {
    for (const auto& fault : section.faults) {
        if (fault.operation.empty() || fault.operation.find_first_of(" \t\r\n") != std::string::npos) {
            checker.Fail("invalid operation name " + Lib::Quote(fault.operation));
        }
        if (fault.count && *fault.count == 0) {
            checker.Fail("fault on " + fault.operation + " has a count of 0 (it must be at least 1)");
        }
    }
}

}  // namespace

const Lib::SectionKind& FaultsSection::Kind() {
    static const Json::JsonSection<FaultsSection> kind("faults", Load, Save, Check);
    return kind;
}

}  // namespace TknCtl::Model
