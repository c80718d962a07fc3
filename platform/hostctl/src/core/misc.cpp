#include "hostctl/misc.h"

namespace HostCtl::Misc {

void StringTokenize(const std::string& text, std::vector<std::string>& out, const std::string& separators) {
    std::size_t start = 0;
    while (start < text.size()) {
        std::size_t end = text.find_first_of(separators, start);
        if (end == std::string::npos) end = text.size();
        if (end > start) out.emplace_back(text, start, end - start);
        start = end + 1;
    }
}

}  // namespace HostCtl::Misc
