#include "commands/nic/nic.h"
#include "hostctl/network/network_info.h"
#include "hostctl/network/nic.h"

namespace TalvexCli::NetworkNamespace {

namespace {

// The load-balancer features in column order; "applicable" is false for those that the
// device has no say in (their first letter is always N).
struct Feature {
    const char* column;
    bool applicable;
};
const Feature kFeatures[HostCtl::Network::PNIC_NETQ_LB_FEATURE_COUNT] = {
    {"RxQPair", true},      {"RxQNoFeature", false}, {"PreEmptibleQ", true}, {"RxQLatency", true},
    {"RxDynamicLB", false}, {"DynamicQPool", true},  {"MacLearnLB", false},  {"RSS", true},
    {"LRO", true},          {"GeneveOAM", true}};

}  // namespace

NicQueueLbSettingList::NicQueueLbSettingList() {
    Frame::Describe(*this,
                    {"List the netqueue load balancer settings of all physical NICs currently installed and "
                     "loaded on the system. Setting legend as follows,\n"
                     "S: Setting supported by device\n"
                     "U: Setting unsupported by device\n"
                     "N: Setting not applicable to device\n"
                     "A: Setting allowed at load balancing\n"
                     "D: Setting disallowed at load balancing\n",
                     "fetcher",
                     "table",
                     {{"fields:Settings",
                       "NIC,RxQPair,RxQNoFeature,PreEmptibleQ,RxQLatency,RxDynamicLB,DynamicQPool,MacLearnLB,"
                       "RSS,LRO,GeneveOAM"}}});
}

InputSpecPtr NicQueueLbSettingList::GetInputSpecInternal() {
    return Frame::MakeInputSpec({});
}

OutputSpecPtr NicQueueLbSettingList::GetOutputSpecInternal() {
    return Frame::ListOutput(GetOutputStructure());
}

RecordPtr NicQueueLbSettingList::GetOutputStructure() {
    std::vector<Frame::Field> fields{Frame::StringField("NIC")};
    for (const auto& feature : kFeatures)
        fields.push_back(Frame::StringField(feature.column));
    return Frame::MakeRecord("Settings", fields);
}

void NicQueueLbSettingList::ExecuteInternal(InputPtr, OutputPtr output) {
    Frame::HostCall(output, [&] {
        auto list = Frame::MakeList(GetOutputStructure());
        Nic::ForEachNetqueue(
            nullptr, {},
            [&](HostCtl::Network::Pnic& pnic, const HostCtl::Network::PnicNetqueueInfo& netqueue) {
                auto record = GetOutputStructure();
                record->SetField("NIC", pnic.GetName());
                for (std::size_t i = 0; i < std::size(kFeatures); ++i) {
                    std::string letters;
                    letters += !kFeatures[i].applicable ? 'N' : netqueue.lbSupported[i] ? 'S' : 'U';
                    letters += netqueue.lbAllowed[i] ? 'A' : 'D';
                    record->SetField(kFeatures[i].column, letters);
                }
                list->Add(record);
            });
        output->SetRootObject(list);
    });
}

}  // namespace TalvexCli::NetworkNamespace
