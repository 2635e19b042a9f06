// Whole processes side by side, in one run: the tool, the floor under it and the machine's `true`.
//   compare          each road's costs, medians over interleaved repetitions
//   compare growth   what the forwarded road costs as sizes grow
// Programs are those beside this one. Everything happens in a device root of its own.
#include <fcntl.h>
#include <spawn.h>
#include <sys/mman.h>
#include <sys/ptrace.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <sys/system_properties.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <string>
#include <vector>

namespace {

using Words = std::vector<std::string>;

constexpr char kPermissiveKey[] = "odm.thp.debug.selinux.permissive";
constexpr char kServiceEnableKey[] = "odm.thp.service_enable";
constexpr char kBinderKey[] = "odm.thp.binder";
constexpr int kMaxReplyBytes = (1 << 20) - 2 * 4096 - 4;  // with terminator and padding

std::string gBuild;   // the build folder
std::string gDevice;  // the device root
int gOutput;          // where the programs' standard output goes: a file in memory

[[noreturn]] void Fail(const char* what) {
    perror(what);
    _exit(1);
}

void SetProperty(const char* key, const std::string& value) {
    if (__system_property_set(key, value.c_str()) != 0) {
        Fail(key);
    }
}

std::vector<char*> Pointers(const Words& words) {
    std::vector<char*> pointers;
    for (const std::string& word : words) {
        pointers.push_back(const_cast<char*>(word.c_str()));
    }
    pointers.push_back(nullptr);
    return pointers;
}

pid_t Spawn(const Words& words) {
    posix_spawn_file_actions_t actions;
    posix_spawn_file_actions_init(&actions);
    posix_spawn_file_actions_adddup2(&actions, gOutput, STDOUT_FILENO);
    pid_t process = 0;
    if (posix_spawn(&process, words[0].c_str(), &actions, nullptr, Pointers(words).data(),
                    environ) != 0) {
        Fail(words[0].c_str());
    }
    posix_spawn_file_actions_destroy(&actions);
    return process;
}

void EmptyOutput() {
    if (ftruncate(gOutput, 0) != 0 || lseek(gOutput, 0, SEEK_SET) != 0) {
        Fail("output");
    }
}

void StartDevice() {
    // In memory where the machine has such a folder: what a disk adds is none of the programs'
    // doing.
    char folder[64];
    snprintf(folder, sizeof(folder), "%s/tpd-bench-XXXXXX",
             access("/dev/shm", W_OK) == 0 ? "/dev/shm" : "/tmp");
    gDevice = mkdtemp(folder);
    setenv("TPD_DEVICE_ROOT", gDevice.c_str(), 1);
    setenv("PATH", (std::string(SOURCE_DIR "/device/bin:") + getenv("PATH")).c_str(), 1);
    gOutput = memfd_create("output", MFD_CLOEXEC);
    SetProperty("odm.thp.dae_reboot_times", "0");
    SetProperty(kServiceEnableKey, "1");
    SetProperty(kPermissiveKey, "true");
    Spawn({gBuild + "/device/corvane_daemon"});
    char value[PROP_VALUE_MAX];
    while (__system_property_get(kBinderKey, value) == 0) {
        usleep(1000);
    }
}

double Now() {
    const auto now = std::chrono::steady_clock::now().time_since_epoch();
    return std::chrono::duration<double, std::micro>(now).count();
}

double Median(std::vector<double> values) {
    std::sort(values.begin(), values.end());
    return values.empty() ? 0 : values[values.size() / 2];
}

// One program on one road, and what each of its runs cost.
struct Runner {
    const char* name;
    Words words;
    std::vector<double> wallUs = {};
    std::vector<double> cpuUs = {};
    std::vector<double> faults = {};

    void Run() {
        EmptyOutput();
        rusage used = {};
        int ended = 0;
        const double start = Now();
        wait4(Spawn(words), &ended, 0, &used);
        wallUs.push_back(Now() - start);
        if (ended != 0) {
            Fail(name);
        }
        cpuUs.push_back(1e6 * static_cast<double>(used.ru_utime.tv_sec + used.ru_stime.tv_sec) +
                        static_cast<double>(used.ru_utime.tv_usec + used.ru_stime.tv_usec));
        faults.push_back(static_cast<double>(used.ru_minflt + used.ru_majflt));
    }
};

// Medians of the ratios of runs that stood next to each other in time.
double Ratio(const std::vector<double>& values, const std::vector<double>& base) {
    std::vector<double> ratios;
    for (size_t i = 0; i < values.size(); ++i) {
        ratios.push_back(values[i] / base[i]);
    }
    return Median(ratios);
}

// What the kernel tells of one traced run of a program and all that it starts.
struct Trace {
    std::vector<long> calls;  // system calls of the program itself, by number
    size_t allCalls = 0;      // with those of the programs it started
    double peakKiB = 0;       // resident memory of the program itself
};

double PeakKiB(pid_t process) {
    FILE* const file = fopen(("/proc/" + std::to_string(process) + "/status").c_str(), "r");
    double peak = 0;
    char line[256];
    while (file != nullptr && fgets(line, sizeof(line), file) != nullptr) {
        sscanf(line, "VmHWM: %lf", &peak);
    }
    fclose(file);
    return peak;
}

Trace TraceRun(const Words& words) {
    EmptyOutput();
    const pid_t process = fork();
    if (process == 0) {
        dup2(gOutput, STDOUT_FILENO);
        ptrace(PTRACE_TRACEME, 0, nullptr, nullptr);
        execv(words[0].c_str(), Pointers(words).data());
        _exit(127);
    }
    waitpid(process, nullptr, 0);
    ptrace(PTRACE_SETOPTIONS, process, nullptr,
           PTRACE_O_TRACESYSGOOD | PTRACE_O_TRACEEXIT | PTRACE_O_TRACEFORK | PTRACE_O_TRACEVFORK |
                   PTRACE_O_TRACECLONE | PTRACE_O_TRACEEXEC | PTRACE_O_EXITKILL);
    ptrace(PTRACE_SYSCALL, process, nullptr, nullptr);
    Trace trace;
    int status = 0;
    for (pid_t stopped; (stopped = waitpid(-1, &status, __WALL)) > 0;) {
        if (!WIFSTOPPED(status)) {
            if (stopped == process) {
                break;
            }
            continue;
        }
        int signal = WSTOPSIG(status);
        if (signal == (SIGTRAP | 0x80)) {
            __ptrace_syscall_info call = {};
            ptrace(PTRACE_GET_SYSCALL_INFO, stopped, sizeof(call), &call);
            if (call.op == PTRACE_SYSCALL_INFO_ENTRY) {
                ++trace.allCalls;
                if (stopped == process) {
                    trace.calls.push_back(static_cast<long>(call.entry.nr));
                }
            }
        } else if (status >> 8 == (SIGTRAP | PTRACE_EVENT_EXIT << 8) && stopped == process) {
            trace.peakKiB = PeakKiB(process);
        }
        if ((signal & ~0x80) == SIGTRAP || signal == SIGSTOP) {
            signal = 0;
        }
        ptrace(PTRACE_SYSCALL, stopped, nullptr, signal);
    }
    if (status != 0) {
        Fail(words[0].c_str());
    }
    return trace;
}

// A program's own work in system calls: what it asks from opening the device root on, without the
// memory it takes.
std::vector<long> Work(const std::vector<long>& calls) {
    std::vector<long> work;
    const auto own = std::find(calls.begin(), calls.end(), SYS_geteuid);  // asked by nobody earlier
    std::copy_if(own, calls.end(), std::back_inserter(work), [](long call) {
        return call != SYS_brk && call != SYS_mmap && call != SYS_munmap && call != SYS_mremap;
    });
    return work;
}

// User instructions in millions: from the processor's counter, else counted by valgrind; 0 when the
// machine has neither.
double Instructions(const Words& words) {
    std::string command;
    for (const std::string& word : words) {
        command += " '" + word + "'";
    }
    const std::string tools[] = {
            "perf stat -x, -e instructions:u" + command + " 2>&1 >/dev/null | sed -n '1s/,.*//p'",
            "valgrind --tool=callgrind --callgrind-out-file=/dev/null" + command +
                    " 2>&1 >/dev/null | sed -n 's/.*Collected : //p'"};
    double count = 0;
    for (size_t i = 0; i < 2 && count == 0; ++i) {
        FILE* const counted = popen(tools[i].c_str(), "r");
        if (fscanf(counted, "%lf", &count) != 1) {
            count = 0;
        }
        pclose(counted);
    }
    return count / 1e6;
}

double FileKiB(const std::string& path) {
    struct stat status = {};
    return stat(path.c_str(), &status) == 0 ? static_cast<double>(status.st_size) / 1024 : 0;
}

struct Road {
    const char* title;
    std::vector<Runner> runners;  // the tool first, its floor second
    const char* key;              // the property to put back before each run
    const char* value;
    int repetitions;
};

std::vector<Runner> Programs(const std::string& word, bool isFloorTold) {
    const Words argument = {word};
    const auto with = [&](const std::string& program, bool told) {
        return told ? Words{program, word} : Words{program};
    };
    return {{"tpd", with(gBuild + "/tpd", true)},
            {"floor", with(gBuild + "/bench/floor", isFloorTold)},
            {"floor, shared libc", with(gBuild + "/bench/floor_shared", isFloorTold)},
            {"true", {"/bin/true"}}};
}

void Compare(Road& road) {
    const auto reset = [&road] { SetProperty(road.key, road.value); };
    for (int i = 0; i < road.repetitions; ++i) {
        for (Runner& runner : road.runners) {
            reset();
            runner.Run();
        }
    }
    printf("\n%s, medians of %d interleaved runs; ratios to the floor\n", road.title,
           road.repetitions);
    printf("  %-19s %9s %6s %9s %6s %7s %6s %6s %5s %9s %8s\n", "", "wall us", "", "cpu us", "",
           "M instr", "faults", "calls", "peak", "KiB", "file KiB");
    std::vector<Trace> traces;
    const Runner& floor = road.runners[1];
    for (const Runner& runner : road.runners) {
        reset();
        traces.push_back(TraceRun(runner.words));
    }
    for (size_t i = 0; i < traces.size(); ++i) {
        const Runner& runner = road.runners[i];
        reset();
        printf("  %-19s %9.1f %6.2f %9.1f %6.2f %7.3f %6.0f %6zu %5.2f %9.0f %8.0f\n", runner.name,
               Median(runner.wallUs), Ratio(runner.wallUs, floor.wallUs), Median(runner.cpuUs),
               Ratio(runner.cpuUs, floor.cpuUs), Instructions(runner.words), Median(runner.faults),
               traces[i].allCalls, traces[i].peakKiB / traces[1].peakKiB, traces[i].peakKiB,
               FileKiB(runner.words[0]));
    }
    const bool alike = Work(traces[0].calls) == Work(traces[1].calls);
    printf("  system calls of tpd and the floor, memory and start-up aside: %s\n",
           alike ? "the same" : "DIFFERENT");
}

// The two whose growth is compared: the tool and the floor.
struct Pair {
    Runner tool{"tpd", {gBuild + "/tpd", "THP_GetVersion"}};
    Runner floor{"floor", {gBuild + "/bench/floor", "THP_GetVersion"}};

    void Print(const std::string& size) const {
        printf("  %12s %9.1f %9.1f %6.2f %9.1f %9.1f %6.2f\n", size.c_str(), Median(tool.wallUs),
               Median(floor.wallUs), Ratio(tool.wallUs, floor.wallUs), Median(tool.cpuUs),
               Median(floor.cpuUs), Ratio(tool.cpuUs, floor.cpuUs));
    }
};

void Heading(const char* title) {
    printf("\n%s\n  %12s %9s %9s %6s %9s %9s %6s\n", title, "", "tpd us", "floor us", "ratio",
           "tpd cpu", "floor cpu", "ratio");
}

void Measure(const std::string& size) {
    constexpr int kRepetitions = 200;
    Pair pair;
    for (int i = 0; i < kRepetitions; ++i) {
        pair.tool.Run();
        pair.floor.Run();
    }
    pair.Print(size);
}

void GrowReply() {
    Heading("Bytes of the reply");
    SetProperty("sim.fault", "huge");
    for (const int size : {1, 16, 256, 4096, 65536, 262144, kMaxReplyBytes}) {
        SetProperty("sim.fault_arg", std::to_string(size));
        Measure(std::to_string(size));
    }
    SetProperty("sim.fault", "");
}

// Runs `total` processes, `clients` of them at a time; processes a second.
double Rate(const Words& words, int clients, int total) {
    EmptyOutput();
    int started = 0;
    const double start = Now();
    for (int ended = 0; ended < total; ++ended) {
        while (started < total && started - ended < clients) {
            Spawn(words);
            ++started;
        }
        int status = 0;
        if (wait(&status) < 0 || status != 0) {
            Fail(words[0].c_str());
        }
    }
    return total / (Now() - start) * 1e6;
}

void GrowClients() {
    constexpr int kRounds = 7;
    constexpr int kProcesses = 256;
    printf("\nClients at once\n  %12s %9s %9s %6s\n", "", "tpd/s", "floor/s", "ratio");
    for (int clients = 1; clients <= 64; clients *= 2) {
        Pair pair;
        std::vector<double> tool;
        std::vector<double> floor;
        for (int i = 0; i < kRounds; ++i) {
            tool.push_back(Rate(pair.tool.words, clients, kProcesses));
            floor.push_back(Rate(pair.floor.words, clients, kProcesses));
        }
        printf("  %12d %9.0f %9.0f %6.2f\n", clients, Median(tool), Median(floor),
               Ratio(tool, floor));
    }
}

void GrowStore() {
    Heading("Properties in the store");
    int made = 6;
    for (const int count : {34, 1000, 10000, 100000}) {
        for (; made < count; ++made) {
            const std::string path = gDevice + "/properties/bench." + std::to_string(made);
            close(open(path.c_str(), O_WRONLY | O_CREAT | O_CLOEXEC, 0600));
        }
        Measure(std::to_string(count));
    }
}

void GrowLog() {
    Heading("Bytes in the log");
    for (const off_t size : {0L, 1L << 20, 1L << 25, 1L << 30}) {
        if (truncate((gDevice + "/log").c_str(), 0) != 0 ||
            truncate((gDevice + "/log").c_str(), size) != 0) {
            Fail("log");
        }
        Measure(std::to_string(size));
    }
}

}  // namespace

int main(int argc, char** argv) {
    char self[4096];
    const ssize_t length = readlink("/proc/self/exe", self, sizeof(self) - 1);
    gBuild.assign(self, length > 0 ? static_cast<size_t>(length) : 0);
    gBuild.erase(gBuild.rfind("/bench/"));
    setvbuf(stdout, nullptr, _IOLBF, 0);
    StartDevice();
    if (argc == 2 && strcmp(argv[1], "growth") == 0) {
        GrowReply();
        GrowClients();
        GrowLog();
        GrowStore();
    } else {
        const int repetitions = argc == 2 ? atoi(argv[1]) : 1000;
        Road roads[] = {
                {"Forwarded command", Programs("THP_GetVersion", true), kPermissiveKey, "true",
                 repetitions},
                {"Local command: stop", Programs("stop", false), kServiceEnableKey, "1",
                 repetitions},
                {"Refused command", Programs("THP_GetVersion", true), kPermissiveKey, "null",
                 repetitions / 10},
        };
        for (Road& road : roads) {
            Compare(road);
        }
    }
    // The daemon goes with this process.
    return system(("rm -rf '" + gDevice + "'").c_str());
}
