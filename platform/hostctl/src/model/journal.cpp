#include "model/journal.h"

#include "core/json_io.h"

namespace TknCtl::Model {

namespace {

void Load(const Json::In& in, JournalSection& section) {
    section.enabled = in.Bool("enabled", false);
    section.lines = in.Strings("lines");
    in.Done();
}

Json::Node Save(const JournalSection& section) {
    return Json::Node{{"enabled", section.enabled}, {"lines", section.lines}};
}

}  // namespace

const Lib::SectionKind& JournalSection::Kind() {
    static const Json::JsonSection<JournalSection> kind("journal", Load, Save, nullptr);
    return kind;
}

}  // namespace TknCtl::Model
