// The in-process hot paths of a command run: reading the state document, parsing a command
// line, running a command and rendering its result, on the default host and on generated
// hosts.
//
//   build/bin/hot_paths [--benchmark_filter=REGEX]
#include <benchmark/benchmark.h>

#include <memory>
#include <sstream>
#include <string>
#include <vector>

#include "core/store.h"
#include "generate.h"
#include "hostctl/session.h"
#include "zorbel/dispatcher.h"
#include "zorbel/formatter.h"

namespace {

using HostCtl::Lib::HostSession;
using Zorbel::AutoCli::Dispatcher;
using Zorbel::AutoCli::GlobalOptions;

Dispatcher& Framework() {
    static std::shared_ptr<Dispatcher> dispatcher = [] {
        auto d = Dispatcher::New("hadrocli");
        std::ostringstream err;
        d->LoadPluginDirectories({HADRO_PLUGIN_DIR}, err);
        return d;
    }();
    return *dispatcher;
}

// Generated documents, by scale in hundredths, as a state file holds them (with digests).
const std::string& Host(long hundredths) {
    static std::vector<std::pair<long, std::string>> hosts;
    for (const auto& [key, text] : hosts) {
        if (key == hundredths) return text;
    }
    TknCtl::Lib::Store store(hundredths == 0
                                 ? HostSession::DefaultDocument()
                                 : Hadro::Sim::GenerateHost(static_cast<double>(hundredths) / 100),
                             "bench");
    store.RewriteAll();
    hosts.emplace_back(hundredths, store.Export());
    return hosts.back().second;
}

std::vector<std::string> Words(const std::string& line) {
    std::vector<std::string> words;
    std::istringstream in(line);
    for (std::string word; in >> word;)
        words.push_back(word);
    return words;
}

// Finding the sections of a document and telling that they are as the library wrote them
// (what every command pays), by scale (0: default host).
void BM_ScanDocument(benchmark::State& state) {
    const std::string& text = Host(state.range(0));
    for (auto _ : state) {
        TknCtl::Lib::Store store(text, "bench");
        benchmark::DoNotOptimize(store.Verify());
    }
    state.SetBytesProcessed(static_cast<std::int64_t>(state.iterations() * text.size()));
}
BENCHMARK(BM_ScanDocument)->Arg(0)->Arg(25)->Arg(100)->Arg(400)->Unit(benchmark::kMicrosecond);

// Parsing and checking every section, by scale.
void BM_LoadAllSections(benchmark::State& state) {
    const std::string& text = Host(state.range(0));
    for (auto _ : state) {
        TknCtl::Lib::Store store(text, "bench");
        store.LoadAll();
    }
    state.SetBytesProcessed(static_cast<std::int64_t>(state.iterations() * text.size()));
}
BENCHMARK(BM_LoadAllSections)->Arg(0)->Arg(25)->Arg(100)->Arg(200)->Arg(400)->Unit(benchmark::kMillisecond);

// Resolving a command line and checking its options (no run).
void BM_ParseCommandLine(benchmark::State& state) {
    auto& dispatcher = Framework();
    const auto args = Words(
        "network vswitch standard policy security set --allow-promiscuous=false --allow-mac-change=true "
        "--allow-forged-transmits=0 --vswitch-name=vSwitch0");
    GlobalOptions options;
    std::ostringstream out, err;
    for (auto _ : state) {
        auto prepared = dispatcher.Prepare(args, options, out, err);
        benchmark::DoNotOptimize(prepared.ready);
    }
}
BENCHMARK(BM_ParseCommandLine);

// A whole read command in a session that is already open, as a batch runs it.
void BM_RunReadCommand(benchmark::State& state) {
    auto session = HostSession::InMemory(Host(0));
    auto& dispatcher = Framework();
    const auto args = Words("network ip interface list");
    GlobalOptions options;
    for (auto _ : state) {
        std::ostringstream out, err;
        int status = dispatcher.Run(args, options, out, err);
        benchmark::DoNotOptimize(status);
    }
}
BENCHMARK(BM_RunReadCommand)->Unit(benchmark::kMicrosecond);

// Running a list command and rendering its result with each formatter, by scale.
void Render(benchmark::State& state, const char* line, const char* formatter) {
    auto session = HostSession::InMemory(Host(state.range(0)));
    auto& dispatcher = Framework();
    GlobalOptions options;
    std::ostringstream out, err;
    auto prepared = dispatcher.Prepare(Words(line), options, out, err);
    auto output = dispatcher.ExecuteRaw(prepared.invocation);
    Zorbel::Format::OutputParameters parameters(prepared.invocation.command->GetDefaultOutputParameters());
    for (auto _ : state) {
        std::string text;
        Zorbel::Format::Render(formatter, *output->GetRootObject(), parameters, text);
        benchmark::DoNotOptimize(text.data());
    }
}
void BM_RenderConnectionsSimple(benchmark::State& state) {
    Render(state, "network ip connection list", "simple");
}
void BM_RenderConnectionsTable(benchmark::State& state) {
    Render(state, "network ip connection list", "table");
}
void BM_RenderConnectionsJson(benchmark::State& state) {
    Render(state, "network ip connection list", "json");
}
BENCHMARK(BM_RenderConnectionsSimple)->Arg(25)->Arg(100)->Arg(400)->Unit(benchmark::kMillisecond);
BENCHMARK(BM_RenderConnectionsTable)->Arg(25)->Arg(100)->Arg(400)->Unit(benchmark::kMillisecond);
BENCHMARK(BM_RenderConnectionsJson)->Arg(25)->Arg(100)->Arg(400)->Unit(benchmark::kMillisecond);

// Running a list command without rendering, on a fresh session each time (the sections it
// touches are parsed), by scale.
void BM_ExecuteListFresh(benchmark::State& state, const char* line) {
    const std::string& text = Host(state.range(0));
    auto& dispatcher = Framework();
    GlobalOptions options;
    std::ostringstream out, err;
    auto prepared = dispatcher.Prepare(Words(line), options, out, err);
    for (auto _ : state) {
        auto session = HostSession::InMemory(text);
        auto output = dispatcher.ExecuteRaw(prepared.invocation);
        benchmark::DoNotOptimize(output.get());
    }
}
BENCHMARK_CAPTURE(BM_ExecuteListFresh, connections, "network ip connection list")
    ->Arg(25)
    ->Arg(100)
    ->Arg(400)
    ->Unit(benchmark::kMillisecond);
BENCHMARK_CAPTURE(BM_ExecuteListFresh, ports, "network vswitch dvs talvex list")
    ->Arg(25)
    ->Arg(100)
    ->Arg(400)
    ->Unit(benchmark::kMillisecond);

}  // namespace

BENCHMARK_MAIN();
