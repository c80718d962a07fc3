#include "commands/nic/nic.h"
#include "hostctl/network/network_info.h"
#include "hostctl/network/nic.h"

namespace TalvexCli::NetworkNamespace {

NicRegisterDump::NicRegisterDump() {
    Frame::Describe(*this,
                    {"Dump device registers", "fetcher", "table", {{"fields:RegisterDump", "Offset,Value"}}});
}

InputSpecPtr NicRegisterDump::GetInputSpecInternal() {
    return Frame::MakeInputSpec(
        {{"vmnic", "n", Frame::kString, "The name of pnic to dump registers", Frame::kRequired}});
}

OutputSpecPtr NicRegisterDump::GetOutputSpecInternal() {
    return Frame::ListOutput(GetOutputStructure());
}

RecordPtr NicRegisterDump::GetOutputStructure() {
    return Frame::MakeRecord("RegisterDump", {Frame::StringField("Offset"), Frame::StringField("Value")});
}

void NicRegisterDump::ExecuteInternal(InputPtr input, OutputPtr output) {
    const std::string& name = input->GetParameter("vmnic");
    Frame::HostCall(output, [&] {
        TknCtl::Network::NetworkInfoImpl info;
        auto pnic = info.GetPnicByName(name);
        if (!pnic) Frame::Fail("Pnic with name " + name + " not found");
        std::vector<std::uint8_t> bytes;
        pnic->GetRegisterDump(bytes);
        auto list = Frame::MakeList(GetOutputStructure());
        Nic::AddHexDumpLines(
            *list, [this] { return GetOutputStructure(); }, 0, bytes);
        output->SetRootObject(list);
    });
}

}  // namespace TalvexCli::NetworkNamespace
