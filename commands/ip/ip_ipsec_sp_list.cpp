#include "commands/ip/ip.h"
#include "hostctl/network/ipsec.h"

namespace TalvexCli::NetworkNamespace {

IpIpsecSPList::IpIpsecSPList() {
    Frame::Describe(*this, {"List configured Security Policys",
                            "fetcher",
                            "table",
                            {{"fields:SecurityPolicy",
                              "Name,Source Address,Source Port,Destination Address,Destination "
                              "Port,Protocol,Flow,Action,Mode,SA Name"}}});
}

InputSpecPtr IpIpsecSPList::GetInputSpecInternal() {
    return Frame::MakeInputSpec({});
}

OutputSpecPtr IpIpsecSPList::GetOutputSpecInternal() {
    return Frame::ListOutput(GetOutputStructure());
}

RecordPtr IpIpsecSPList::GetOutputStructure() {
    return Frame::MakeRecord("SecurityPolicy", {
                                                   Frame::StringField("Name"),
                                                   Frame::StringField("Source Address"),
                                                   Frame::IntField("Source Port"),
                                                   Frame::StringField("Destination Address"),
                                                   Frame::IntField("Destination Port"),
                                                   Frame::StringField("Protocol"),
                                                   Frame::StringField("Flow"),
                                                   Frame::StringField("Action"),
                                                   Frame::StringField("Mode"),
                                                   Frame::StringField("SA Name"),
                                               });
}

void IpIpsecSPList::ExecuteInternal(InputPtr, OutputPtr output) {
    using Config = TknCtl::Network::IpSecConfigImpl;
    Frame::HostCall(output, [&] {
        Config ipsec;
        std::vector<HostCtl::Network::IpSecSpdParam> sps;
        ipsec.GetSPDConfigList(sps);
        auto list = Frame::MakeList(GetOutputStructure());
        bool orphans = false;
        for (const auto& sp : sps) {
            auto record = GetOutputStructure();
            record->SetField("Name", sp.spName);
            record->SetField("Source Address", sp.sourceAddress.GetStringAddress() + "/" +
                                                   std::to_string(sp.sourcePrefixLength));
            record->SetField("Source Port", sp.sourcePort);
            record->SetField("Destination Address", sp.destinationAddress.GetStringAddress() + "/" +
                                                        std::to_string(sp.destinationPrefixLength));
            record->SetField("Destination Port", sp.destinationPort);
            record->SetField("Protocol", Ipsec::TableName(Config::SP_UL_PROTO_TYPE, sp.protocol));
            record->SetField("Flow", Ipsec::TableName(Config::SP_DIRECTION, sp.direction));
            record->SetField("Action", Ipsec::TableName(Config::SP_ACTION, sp.action));
            record->SetField("Mode", Ipsec::TableName(Config::SA_MODE, sp.mode));
            if (sp.saName == "UNKNOWN") {
                // The SP's own SA was removed.
                record->SetField("SA Name", sp.saName + "*");
                orphans = true;
            } else {
                record->SetField("SA Name", sp.saName);
            }
            list->Add(record);
        }
        output->SetRootObject(list);
        if (orphans) {
            output->AddErrorMessage(
                "*Some SPs with unique but deleted SAs were found. Please remove these SPs as they cannot be "
                "used "
                "anymore.");
        }
    });
}

}  // namespace TalvexCli::NetworkNamespace
