#include "processes.h"

#include <stdlib.h>
#include <sys/wait.h>

#include <filesystem>
#include <fstream>
#include <sstream>

namespace Hadro::Test {

namespace {

std::string Slurp(const std::string& path) {
    std::ifstream in(path, std::ios::binary);
    std::ostringstream text;
    text << in.rdbuf();
    return text.str();
}

}  // namespace

void EndToEndTest::SetUp() {
    std::string pattern = (std::filesystem::temp_directory_path() / "hadro-e2e-XXXXXX").string();
    ASSERT_NE(mkdtemp(pattern.data()), nullptr);
    dir_ = pattern;
    state_ = dir_ + "/host.json";
}

void EndToEndTest::TearDown() {
    if (!dir_.empty()) std::filesystem::remove_all(dir_);
}

ProcessResult EndToEndTest::Program(const std::string& program, const std::string& arguments) const {
    const std::string out = dir_ + "/stdout", err = dir_ + "/stderr";
    const std::string command = "'" + program + "' --state='" + state_ + "' " + arguments + " >'" + out +
                                "' 2>'" + err + "' </dev/null";
    const int raw = std::system(command.c_str());
    ProcessResult result;
    result.status = raw != -1 && WIFEXITED(raw) ? WEXITSTATUS(raw) : -1;
    result.out = Slurp(out);
    result.err = Slurp(err);
    return result;
}

}  // namespace Hadro::Test
