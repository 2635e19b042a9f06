// The tool's parts inside one process, each beside the same work done by hand; both in one run.
#include <benchmark/benchmark.h>

#include <android/log.h>
#include <binder/Binder.h>
#include <binder/IPCThreadState.h>
#include <binder/IServiceManager.h>
#include <binder/Parcel.h>
#include <binder/ProcessState.h>
#include <fcntl.h>
#include <sched.h>
#include <sys/prctl.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/system_properties.h>
#include <sys/un.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <map>
#include <string>
#include <vector>

#include "binder/ICorvaneInterfaceClient.h"
#include "binder/corvane_sys_binder_client.h"
#include "cmdline/CmdLine.h"
#include "daemon/TpdClient.h"
#include "log/Log.h"
#include "property/Property.h"

namespace {

using benchmark::DoNotOptimize;
using benchmark::State;

constexpr char kServiceName[] = "service.corvaneinterfaceservice";
constexpr char kAliveKey[] = "odm.thp.dae_alive";
constexpr char kEnableKey[] = "odm.thp.service_enable";
constexpr char kSignature[] = "std::string TpdClient::RunCmd(const char*, const char*)";
constexpr int kLargestReply = (1 << 20) - 2 * 4096 - 4;  // with terminator and padding
constexpr int kReplies[] = {16, 4096, kLargestReply};

int gRoot;  // the device root
int gLog;

// The daemon: its answer has as many bytes as the command says.
class Service : public android::BBinder {
    android::status_t onTransact(uint32_t, const android::Parcel& data, android::Parcel* reply,
                                 uint32_t) override {
        data.enforceInterface(ICorvaneInterfaceClient::descriptor);
        mText.resize(strtoul(data.readCString(), nullptr, 10), '#');
        return reply->writeCString(mText.c_str());
    }

    std::string mText;
};

void WriteFile(const char* path, const std::string& text) {
    const int file = openat(gRoot, path, O_WRONLY | O_CREAT | O_TRUNC, 0600);
    if (write(file, text.data(), text.size()) != static_cast<ssize_t>(text.size())) {
        _exit(1);
    }
    close(file);
}

std::string ReadFile(const char* path) {
    static char text[8192];
    const int file = openat(gRoot, path, O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC);
    const ssize_t size = read(file, text, sizeof(text));
    close(file);
    return std::string(text, size > 0 ? static_cast<size_t>(size) : 0);
}

size_t ReadValue(const char* path, char* value) {
    const int file = openat(gRoot, path, O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC);
    const ssize_t size = read(file, value, PROP_VALUE_MAX - 1);
    close(file);
    value[size > 0 ? size : 0] = '\0';
    return static_cast<size_t>(size);
}

// A boot command line of about this many bytes.
std::string BootLine(int64_t size) {
    std::string line;
    for (int i = 0; static_cast<int64_t>(line.size()) < size; ++i) {
        line += "androidboot.key" + std::to_string(i) + "=value" + std::to_string(i) + " ";
    }
    return line.substr(0, static_cast<size_t>(size) - 1) + "\n";
}

void PropertyTool(State& state) {
    for (auto _ : state) {
        Property property;
        DoNotOptimize(property);
    }
}

void PropertyBare(State& state) {
    struct Row {
        std::string alias, key, defaultValue;
    };
    Property property;
    const PropertyItem like = property.GetItem("RebootTimes");
    for (auto _ : state) {
        std::vector<Row> rows;
        for (int i = 0; i < 34; ++i) {
            rows.push_back({like.alias.c_str(), like.key.c_str(), like.defaultValue.c_str()});
        }
        DoNotOptimize(rows);
    }
}

void GetHitTool(State& state) {
    Property property;
    std::string value;
    for (auto _ : state) {
        DoNotOptimize(property.Get(kAliveKey, value, "false"));
    }
}

void GetHitBare(State& state) {
    char value[PROP_VALUE_MAX];
    for (auto _ : state) {
        DoNotOptimize(ReadValue("properties/odm.thp.dae_alive", value));
    }
}

void SetSameTool(State& state) {
    Property property;
    for (auto _ : state) {
        property.Set(kAliveKey, "true");
    }
}

void SetSameBare(State& state) {
    char value[PROP_VALUE_MAX];
    for (auto _ : state) {
        ReadValue("properties/odm.thp.dae_alive", value);
        DoNotOptimize(strcmp(value, "true"));
    }
}

void SetChangeTool(State& state) {
    Property property;
    int value = 0;
    for (auto _ : state) {
        property.Set(kEnableKey, (value ^= 1) != 0 ? "1" : "0");
    }
}

void SetChangeBare(State& state) {
    char old[PROP_VALUE_MAX];
    int value = 0;
    for (auto _ : state) {
        const char* const text = (value ^= 1) != 0 ? "1" : "0";
        ReadValue("properties/odm.thp.service_enable", old);
        struct stat status;
        fstatat(gRoot, "properties/odm.thp.service_enable", &status, AT_SYMLINK_NOFOLLOW);
        WriteFile("tmp/bare", text);
        renameat(gRoot, "tmp/bare", gRoot, "properties/odm.thp.service_enable");
        __android_log_print(ANDROID_LOG_ERROR, "corvane_daemon",
                            "retry:1, i = 0, odm.thp.service_enable, [new]%s, [old]%s", text, old);
        usleep(100);
        ReadValue("properties/odm.thp.service_enable", old);
    }
}

void PauseBare(State& state) {
    for (auto _ : state) {
        usleep(100);
    }
}

void AliveTool(State& state) {
    for (auto _ : state) {
        std::string info;
        DoNotOptimize(TpdClient::IsDaemonAlive(info));
    }
}

void AliveBare(State& state) {
    char alive[PROP_VALUE_MAX];
    char binder[PROP_VALUE_MAX];
    char info[64];
    for (auto _ : state) {
        ReadValue("properties/odm.thp.dae_alive", alive);
        ReadValue("properties/odm.thp.binder", binder);
        snprintf(info, sizeof(info), "thp.dae_alive : %d. thp.binder: %d",
                 strcmp(alive, "true") == 0, strcmp(binder, "1") == 0);
        DoNotOptimize(info);
    }
}

// One pass over the text, each field a string of its own.
std::vector<std::string> Fields(const char* at, const char* end) {
    std::vector<std::string> fields;
    while (at < end) {
        const char* stop = static_cast<const char*>(memchr(at, ' ', end - at));
        stop = stop != nullptr ? stop : end;
        if (stop > at) {
            fields.emplace_back(at, stop);
        }
        at = stop + 1;
    }
    return fields;
}

void BootTool(State& state) {
    WriteFile("proc/cmdline", BootLine(state.range(0)));
    for (auto _ : state) {
        const CmdLine line;
        DoNotOptimize(line.IsUpgradeMode() || line.IsFactoryVersion());
    }
}

void BootBare(State& state) {
    WriteFile("proc/cmdline", BootLine(state.range(0)));
    for (auto _ : state) {
        const std::string line = ReadFile("proc/cmdline");
        std::map<std::string, std::string> pairs;
        for (const std::string& field : Fields(line.data(), line.data() + line.size() - 1)) {
            const size_t equal = field.find('=');
            pairs.emplace(field.substr(0, equal), field.substr(equal + 1));
        }
        DoNotOptimize(pairs.count("enter_recovery") + pairs.count("enter_erecovery") +
                      pairs.count("androidboot.swtype"));
    }
}

void SplitTool(State& state) {
    const std::string line = BootLine(state.range(0));
    for (auto _ : state) {
        DoNotOptimize(Split(line, " "));
    }
}

void SplitBare(State& state) {
    const std::string line = BootLine(state.range(0));
    for (auto _ : state) {
        DoNotOptimize(Fields(line.data(), line.data() + line.size()));
    }
}

void ExecuteTool(State& state) {
    const android::sp<BpCorvaneInterfaceClient> client = new BpCorvaneInterfaceClient(new Service);
    for (auto _ : state) {
        std::string reply;
        client->ExecuteCommand(reply, "[TPD]16", "params");
        DoNotOptimize(reply);
    }
}

void ExecuteBare(State& state) {
    const android::sp<Service> service = new Service;
    for (auto _ : state) {
        android::Parcel request;
        android::Parcel answer;
        request.writeInterfaceToken(ICorvaneInterfaceClient::descriptor);
        request.writeCString("16");
        request.writeInt32(1);
        request.writeCString("params");
        service->transact(0, request, &answer, 0);
        const std::string reply = answer.readCString();
        DoNotOptimize(reply);
    }
}

void RunTool(State& state) {
    const std::string command = "[TPD]" + std::to_string(state.range(0));
    for (auto _ : state) {
        DoNotOptimize(RunCmdParms(command, ""));
    }
}

// The socket's own cost: the same bytes there and back, into one buffer.
void RunBare(State& state) {
    sockaddr_un address = {AF_UNIX, ""};
    snprintf(address.sun_path, sizeof(address.sun_path), "/proc/self/fd/%d/dev/vndbinder/%s", gRoot,
             kServiceName);
    const int connection = socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0);
    if (connect(connection, reinterpret_cast<sockaddr*>(&address), sizeof(address)) != 0) {
        state.SkipWithError("cannot connect");
        return;
    }
    android::Parcel body;
    body.writeInterfaceToken(ICorvaneInterfaceClient::descriptor);
    body.writeCString(std::to_string(state.range(0)).c_str());
    body.writeInt32(0);
    const uint32_t head[] = {0, 0x10, static_cast<uint32_t>(body.dataSize())};
    std::string request(reinterpret_cast<const char*>(head), sizeof(head));
    request.append(reinterpret_cast<const char*>(body.data()), body.dataSize());
    std::vector<char> reply(kLargestReply + 8);
    for (auto _ : state) {
        uint32_t answer[2];
        send(connection, request.data(), request.size(), MSG_NOSIGNAL);
        recv(connection, answer, sizeof(answer), MSG_WAITALL);
        recv(connection, reply.data(), answer[1], MSG_WAITALL);
        DoNotOptimize(reply.data());
    }
    close(connection);
}

void CopyBare(State& state) {
    const std::vector<char> from(static_cast<size_t>(state.range(0)), '#');
    std::vector<char> to(from.size());
    for (auto _ : state) {
        memcpy(to.data(), from.data(), from.size());
        benchmark::ClobberMemory();
    }
}

// The same into memory that is new each time, as a text that is handed over must be.
void StringBare(State& state) {
    const std::string from(static_cast<size_t>(state.range(0)), '#');
    for (auto _ : state) {
        DoNotOptimize(std::string(from));
    }
}

void FilteredTool(State& state) {
    for (auto _ : state) {
        gSysLog.Printf(LOG_DEBUG, "RunCmd", 120, "failed");
    }
}

void FilteredBare(State& state) {
    LogBase* facility = &gSysLog;
    for (auto _ : state) {
        DoNotOptimize(facility);
        DoNotOptimize(facility->GetLogLevel() < LOG_DEBUG);
    }
}

void WrittenTool(State& state) {
    for (auto _ : state) {
        gSysLog.Printf(LOG_INFO, kSignature, 120, "%s %d", "failed", 7);
    }
}

void WrittenBare(State& state) {
    for (auto _ : state) {
        __android_log_print(ANDROID_LOG_INFO, "corvane_daemon", "%s[%d] %s %d", "TpdClient::RunCmd",
                            120, "failed", 7);
    }
}

// The kernel's part of it: the line's bytes in one append.
void AppendBare(State& state) {
    constexpr char kLine[] =
            "01-01 00:00:00.000 00000 00000 I corvane_daemon: TpdClient::RunCmd[120] failed 7\n";
    for (auto _ : state) {
        DoNotOptimize(write(gLog, kLine, sizeof(kLine) - 1));
    }
}

void TrimTool(State& state) {
    for (auto _ : state) {
        DoNotOptimize(gSysLog.PrettyTrim(kSignature));
    }
}

void TrimBare(State& state) {
    const std::string signature = kSignature;
    for (auto _ : state) {
        const char* const end = strchr(signature.c_str(), '(');
        const void* const space =
                memrchr(signature.c_str(), ' ', static_cast<size_t>(end - signature.c_str()));
        DoNotOptimize(std::string(static_cast<const char*>(space) + 1, end));
    }
}

struct Subject {
    const char* name;
    void (*tool)(State&);
    void (*bare)(State&);
    std::vector<int> sizes;  // empty: of one size only
};

const Subject kSubjects[] = {
        {"Property", PropertyTool, PropertyBare, {}},
        {"Get hit", GetHitTool, GetHitBare, {}},
        {"Set no-op", SetSameTool, SetSameBare, {}},
        {"Set change", SetChangeTool, SetChangeBare, {}},
        {"pause of 100 us", nullptr, PauseBare, {}},
        {"IsDaemonAlive", AliveTool, AliveBare, {}},
        {"CmdLine", BootTool, BootBare, {200, 8191}},
        {"Split", SplitTool, SplitBare, {200, 8191}},
        {"ExecuteCommand", ExecuteTool, ExecuteBare, {}},
        {"RunCmdParms", RunTool, RunBare, {std::begin(kReplies), std::end(kReplies)}},
        {"memcpy", nullptr, CopyBare, {std::begin(kReplies), std::end(kReplies)}},
        {"new std::string", nullptr, StringBare, {std::begin(kReplies), std::end(kReplies)}},
        {"Printf filtered", FilteredTool, FilteredBare, {}},
        {"Printf written", WrittenTool, WrittenBare, {}},
        {"append to the log", nullptr, AppendBare, {}},
        {"PrettyTrim", TrimTool, TrimBare, {}},
};

// Keeps the medians by name, for the table.
class Medians : public benchmark::BenchmarkReporter {
  public:
    bool ReportContext(const Context&) override { return true; }

    void ReportRuns(const std::vector<Run>& runs) override {
        for (const Run& run : runs) {
            if (run.run_type == Run::RT_Aggregate && run.aggregate_name == "median") {
                mNs[run.run_name.str()] = run.GetAdjustedRealTime();
            }
        }
    }

    void Print() const {
        printf("%-24s %12s %12s %7s\n", "", "tool ns", "by hand ns", "ratio");
        const double pause = Ns("bare/pause of 100 us");
        for (const Subject& subject : kSubjects) {
            for (const int size : subject.sizes.empty() ? std::vector<int>{0} : subject.sizes) {
                const std::string name =
                        subject.name + (size > 0 ? "/" + std::to_string(size) : "");
                const bool paused = subject.tool == SetChangeTool;
                PrintRow(name, Ns("tool/" + name), Ns("bare/" + name));
                if (paused) {
                    PrintRow(name + ", pause off", Ns("tool/" + name) - pause,
                             Ns("bare/" + name) - pause);
                }
            }
        }
        const std::string largest = "/" + std::to_string(kLargestReply);
        printf("Largest reply: %.2f copies of it beyond the socket's own cost\n",
               (Ns("tool/RunCmdParms" + largest) - Ns("bare/RunCmdParms" + largest)) /
                       Ns("bare/memcpy" + largest));
    }

  private:
    double Ns(const std::string& name) const {
        const auto found = mNs.find(name);
        return found != mNs.end() ? found->second : 0;
    }

    static void PrintRow(const std::string& name, double tool, double bare) {
        if (tool > 0) {
            printf("%-24s %12.1f %12.1f %7.2f\n", name.c_str(), tool, bare, tool / bare);
        } else if (bare > 0) {
            printf("%-24s %12s %12.1f\n", name.c_str(), "", bare);
        }
    }

    std::map<std::string, double> mNs;
};

void Register(const char* side, const Subject& subject, void (*work)(State&)) {
    if (work == nullptr) {
        return;
    }
    auto* const made =
            benchmark::RegisterBenchmark((std::string(side) + "/" + subject.name).c_str(), work);
    for (const int size : subject.sizes) {
        made->Arg(size);
    }
}

// A device root with the daemon's service and properties; the service's process goes with this one.
void StartDevice(const char* folder) {
    setenv("TPD_DEVICE_ROOT", folder, 1);
    gRoot = open(folder, O_PATH | O_DIRECTORY | O_CLOEXEC);
    mkdirat(gRoot, "proc", 0700);
    gLog = openat(gRoot, "log", O_WRONLY | O_APPEND | O_CREAT | O_CLOEXEC, 0600);
    android::ProcessState::initWithDriver("/dev/vndbinder");
    android::defaultServiceManager()->addService(android::String16(kServiceName), new Service);
    if (fork() == 0) {
        prctl(PR_SET_PDEATHSIG, SIGKILL);
        android::IPCThreadState::self()->joinThreadPool();
    }
    __system_property_set(kAliveKey, "true");
    __system_property_set("odm.thp.binder", "1");
    __system_property_set(kEnableKey, "0");
}

}  // namespace

int main(int argc, char** argv) {
    // In memory where the machine has such a folder, and all on one processor: neither a disk nor
    // where the scheduler puts the service is what is measured.
    char folder[64];
    snprintf(folder, sizeof(folder), "%s/tpd-bench-XXXXXX",
             access("/dev/shm", W_OK) == 0 ? "/dev/shm" : "/tmp");
    cpu_set_t one;
    CPU_ZERO(&one);
    CPU_SET(sched_getcpu(), &one);
    sched_setaffinity(0, sizeof(one), &one);
    StartDevice(mkdtemp(folder));
    std::vector<char*> words(argv, argv + argc);
    char interleave[] = "--benchmark_enable_random_interleaving=true";
    char repetitions[] = "--benchmark_repetitions=9";
    char shortRuns[] = "--benchmark_min_time=0.02";
    words.insert(words.begin() + 1, {interleave, repetitions, shortRuns});
    int count = static_cast<int>(words.size());
    benchmark::Initialize(&count, words.data());
    for (const Subject& subject : kSubjects) {
        Register("tool", subject, subject.tool);
        Register("bare", subject, subject.bare);
    }
    Medians medians;
    benchmark::RunSpecifiedBenchmarks(&medians);
    medians.Print();
    return system((std::string("rm -rf '") + folder + "'").c_str());
}
