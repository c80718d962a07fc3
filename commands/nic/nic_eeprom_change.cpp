#include "commands/nic/nic.h"
#include "hostctl/network/network_info.h"
#include "hostctl/network/nic.h"

namespace TalvexCli::NetworkNamespace {

NicEepromChange::NicEepromChange() {
    Frame::Describe(*this, {"Change EEPROM on a nic"});
}

InputSpecPtr NicEepromChange::GetInputSpecInternal() {
    return Frame::MakeInputSpec({
        {"vmnic", "n", Frame::kString, "Name of vmnic to change EEPROM.", Frame::kRequired},
        {"offset", "o", Frame::kInt, "Offset of EEPROM to change"},
        {"value", "v", Frame::kInt, "New EEPROM value in double word"},
        {"file", "f", Frame::kString, "File name of new EEPROM content"},
        {"magic", "m", Frame::kInt, "Magic key of EEPROM"},
    });
}

OutputSpecPtr NicEepromChange::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

void NicEepromChange::ExecuteInternal(InputPtr input, OutputPtr output) {
    const std::string& name = input->GetParameter("vmnic");
    Frame::HostCall(output, [&] {
        TknCtl::Network::NetworkInfoImpl info;
        auto pnic = info.GetPnicByName(name);
        if (!pnic) Frame::Fail("Pnic with name " + name + " not found");
        const std::int64_t magic = input->GetParameterInt("magic");
        const bool hasOffset = input->HasParameter("offset");
        const bool hasValue = input->HasParameter("value");
        if (input->HasParameter("file")) {
            if (hasOffset || hasValue)
                Frame::Fail("Parameter --file can't be specified together with --offset and --value");
            pnic->SetEepromFromFile(magic, input->GetParameter("file"));
        } else if (hasOffset && hasValue) {
            pnic->SetEepromValue(magic, input->GetParameterInt("offset"), input->GetParameterInt("value"));
        } else {
            Frame::Fail("Need to specify atleast one of --offset, --value or --file");
        }
        Frame::SetResult(output, true);
    });
}

}  // namespace TalvexCli::NetworkNamespace
