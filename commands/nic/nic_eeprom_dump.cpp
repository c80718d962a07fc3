#include "commands/nic/nic.h"
#include "hostctl/network/network_info.h"
#include "hostctl/network/nic.h"

namespace TalvexCli::NetworkNamespace {

NicEepromDump::NicEepromDump() {
    Frame::Describe(*this,
                    {"Dump device EEPROM", "fetcher", "table", {{"fields:EepromDump", "Offset,Value"}}});
}

InputSpecPtr NicEepromDump::GetInputSpecInternal() {
    return Frame::MakeInputSpec({
        {"vmnic", "n", Frame::kString, "The name of pnic to dump EEPROM", Frame::kRequired},
        {"offset", "o", Frame::kInt, "Offset of EEPROM starting to dump"},
        {"length", "l", Frame::kInt, "Bytes of EEPROM to dump"},
    });
}

OutputSpecPtr NicEepromDump::GetOutputSpecInternal() {
    return Frame::ListOutput(GetOutputStructure());
}

RecordPtr NicEepromDump::GetOutputStructure() {
    return Frame::MakeRecord("EepromDump", {Frame::StringField("Offset"), Frame::StringField("Value")});
}

void NicEepromDump::ExecuteInternal(InputPtr input, OutputPtr output) {
    const std::string& name = input->GetParameter("vmnic");
    Frame::HostCall(output, [&] {
        TknCtl::Network::NetworkInfoImpl info;
        auto pnic = info.GetPnicByName(name);
        if (!pnic) Frame::Fail("Pnic with name " + name + " not found");
        const std::int64_t offset = input->HasParameter("offset") ? input->GetParameterInt("offset") : 0;
        const std::int64_t length = input->HasParameter("length") ? input->GetParameterInt("length") : 0;
        std::vector<std::uint8_t> bytes;
        // The library refuses a negative offset or length, so the start below is a real offset.
        pnic->GetEepromDump(bytes, length, offset);
        auto list = Frame::MakeList(GetOutputStructure());
        Nic::AddHexDumpLines(
            *list, [this] { return GetOutputStructure(); }, static_cast<std::uint64_t>(offset), bytes);
        output->SetRootObject(list);
    });
}

}  // namespace TalvexCli::NetworkNamespace
