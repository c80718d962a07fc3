#include "commands/nic/nic.h"
#include "hostctl/network/network_info.h"
#include "hostctl/network/nic.h"

namespace TalvexCli::NetworkNamespace {

NicSelfTestRun::NicSelfTestRun() {
    Frame::Describe(*this, {"Run self test", "fetcher", "table", {{"fields:EepromDump", "Item,Value"}}});
}

InputSpecPtr NicSelfTestRun::GetInputSpecInternal() {
    return Frame::MakeInputSpec({
        {"vmnic", "n", Frame::kString, "The name of pnic to dump EEPROM", Frame::kRequired},
        {"online", "o", Frame::kInt,
         "Performing limited set of tests do not inetrrupt normal adapter operation, default is offline",
         Frame::kOptional, Frame::Range(0, 1)},
    });
}

OutputSpecPtr NicSelfTestRun::GetOutputSpecInternal() {
    return Frame::ListOutput(GetOutputStructure());
}

RecordPtr NicSelfTestRun::GetOutputStructure() {
    return Frame::MakeRecord("EepromDump", {Frame::StringField("Item"), Frame::StringField("Value")});
}

void NicSelfTestRun::ExecuteInternal(InputPtr input, OutputPtr output) {
    const std::string& name = input->GetParameter("vmnic");
    Frame::HostCall(output, [&] {
        TknCtl::Network::NetworkInfoImpl info;
        auto pnic = info.GetPnicByName(name);
        if (!pnic) Frame::Fail("Pnic with name " + name + " not found");
        const bool online = input->HasParameter("online") && input->GetParameterInt("online") != 0;
        HostCtl::Network::PnicSelfTestResult result;
        pnic->RunSelfTest(result, online);
        auto list = Frame::MakeList(GetOutputStructure());
        auto add = [&](const char* item, const std::string& value) {
            auto record = GetOutputStructure();
            record->SetField("Item", item);
            record->SetField("Value", value);
            list->Add(record);
        };
        add("Result", result.failed ? "Failed" : "Passed");
        for (const auto& line : result.info)
            add("Info", line);
        output->SetRootObject(list);
    });
}

}  // namespace TalvexCli::NetworkNamespace
