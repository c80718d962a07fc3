#include "commands/ip/ip.h"
#include "hostctl/network/ipsec.h"

namespace TalvexCli::NetworkNamespace {

IpIpsecSAList::IpIpsecSAList() {
    Frame::Describe(*this, {"List configured Security Associations",
                            "fetcher",
                            "table",
                            {{"fields:SecurityAssociation",
                              "Name,Source Address,Destination Address,State,SPI,Mode,Encryption "
                              "Algorithm,Integrity Algorithm,Lifetime"}}});
}

InputSpecPtr IpIpsecSAList::GetInputSpecInternal() {
    return Frame::MakeInputSpec({});
}

OutputSpecPtr IpIpsecSAList::GetOutputSpecInternal() {
    return Frame::ListOutput(GetOutputStructure());
}

RecordPtr IpIpsecSAList::GetOutputStructure() {
    return Frame::MakeRecord("SecurityAssociation", {
                                                        Frame::StringField("Name"),
                                                        Frame::StringField("Source Address"),
                                                        Frame::StringField("Destination Address"),
                                                        Frame::StringField("State"),
                                                        Frame::StringField("SPI"),
                                                        Frame::StringField("Mode"),
                                                        Frame::StringField("Encryption Algorithm"),
                                                        Frame::StringField("Integrity Algorithm"),
                                                        Frame::StringField("Lifetime"),
                                                    });
}

namespace {
std::string SpiText(std::uint32_t spi) {
    static const char digits[] = "0123456789abcdef";
    std::string hex;
    do {
        hex.insert(hex.begin(), digits[spi % 16]);
        spi /= 16;
    } while (spi != 0);
    return "0x" + hex;
}
}  // namespace

void IpIpsecSAList::ExecuteInternal(InputPtr, OutputPtr output) {
    using Config = TknCtl::Network::IpSecConfigImpl;
    Frame::HostCall(output, [&] {
        Config ipsec;
        std::vector<HostCtl::Network::IpSecSadParam> sas;
        ipsec.GetSADConfigList(sas);
        auto list = Frame::MakeList(GetOutputStructure());
        for (const auto& sa : sas) {
            auto record = GetOutputStructure();
            record->SetField("Name", sa.name);
            record->SetField("Source Address", sa.source.GetStringAddress());
            record->SetField("Destination Address", sa.destination.GetStringAddress());
            record->SetField("State", Ipsec::TableName(Config::SA_STATE, sa.state));
            record->SetField("SPI", SpiText(sa.spi));
            record->SetField("Mode", Ipsec::TableName(Config::SA_MODE, sa.mode));
            record->SetField("Encryption Algorithm",
                             Ipsec::TableName(Config::SA_ENCPT_ALG, sa.encryptionAlgorithm));
            record->SetField("Integrity Algorithm",
                             Ipsec::TableName(Config::SA_AUTH_ALG, sa.integrityAlgorithm));
            record->SetField("Lifetime", ConvertToHrsMinsAndSecs(sa.lifetime));
            list->Add(record);
        }
        output->SetRootObject(list);
    });
}

}  // namespace TalvexCli::NetworkNamespace
