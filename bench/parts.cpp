// Measures parts of the tool in one process, beside a baseline that does the same work directly.
// Needs a new device root. Pin the process to one processor (taskset); otherwise the results depend
// on where the scheduler runs the service's thread.
#include <benchmark/benchmark.h>

#include <android/log.h>
#include <binder/Binder.h>
#include <binder/Parcel.h>
#include <fcntl.h>
#include <malloc.h>
#include <sys/socket.h>
#include <sys/system_properties.h>
#include <unistd.h>

#include <cstdlib>
#include <string>
#include <vector>

#include "binder/ICorvaneInterfaceClient.h"
#include "binder/corvane_sys_binder_client.h"
#include "log/Log.h"
#include "platform/device_root.h"
#include "platform/files.h"
#include "platform/libbinder/vndbinder.h"
#include "property/Property.h"

namespace {

using benchmark::DoNotOptimize;
using benchmark::State;

constexpr char kDriver[] = "/dev/vndbinder";
constexpr char kServiceName[] = "service.corvaneinterfaceservice";
constexpr char kKey[] = "odm.thp.dae_alive";
constexpr int kLargestReply =
        host::kMaxTransactionBytes - 4;  // bytes, without the terminator and padding

// Stands in for the daemon. The command is the size of the answer in bytes.
class Service : public android::BBinder {
    android::status_t onTransact(uint32_t /* code */, const android::Parcel& data,
                                 android::Parcel* reply, uint32_t /* flags */) override {
        data.enforceInterface(ICorvaneInterfaceClient::descriptor);
        mText.resize(strtoul(data.readCString(), nullptr, 10), '#');
        return reply->writeCString(mText.c_str());
    }

    std::string mText;
};

// The system calls that read one property.
void ReadBaseline(State& state) {
    char value[PROP_VALUE_MAX];
    for (auto _ : state) {
        const int file = openat(host::DeviceRoot(), "properties/odm.thp.dae_alive",
                                O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC);
        DoNotOptimize(read(file, value, PROP_VALUE_MAX - 1));
        close(file);
    }
}
BENCHMARK(ReadBaseline)->Name("Get/baseline");
BENCHMARK(ReadBaseline)->Name("Set, no change/baseline");

void GetTpd(State& state) {
    Property property;
    std::string value;
    for (auto _ : state) {
        DoNotOptimize(property.Get(kKey, value, "false"));
    }
}
BENCHMARK(GetTpd)->Name("Get/tpd");

void SetSameTpd(State& state) {
    Property property;
    for (auto _ : state) {
        property.Set(kKey, "true");
    }
}
BENCHMARK(SetSameTpd)->Name("Set, no change/tpd");

// The processor time includes the service's thread.
void EachReply(benchmark::internal::Benchmark* run) {
    run->MeasureProcessCPUTime()->Arg(16)->Arg(4096)->Arg(kLargestReply);
}

void RunTpd(State& state) {
    const std::string command = kTwoWayMarker + std::to_string(state.range(0));
    for (auto _ : state) {
        DoNotOptimize(RunCmdParms(command, ""));
    }
}
BENCHMARK(RunTpd)->Name("RunCmdParms/tpd")->Apply(EachReply);

// Sends and receives the same bytes on an open socket, into one buffer.
void RunBaseline(State& state) {
    android::Parcel request;
    request.writeInterfaceToken(ICorvaneInterfaceClient::descriptor);
    request.writeCString(std::to_string(state.range(0)).c_str());
    request.writeInt32(0);
    const host::RequestHeader header = {0, 0x10, 0};
    host::ReplyHeader reply = {};
    std::vector<char> buffer(host::kMaxTransactionBytes);
    const host::UniqueFd connection = host::NewSocket();
    const host::UniqueFd directory = host::OpenDirectory(kDriver + 1);
    const sockaddr_un address = host::Address(directory, kServiceName);
    connect(connection.get(), reinterpret_cast<const sockaddr*>(&address), sizeof(address));
    for (auto _ : state) {
        host::SendMessage(connection, header, request);
        host::Receive(connection, &reply, sizeof(reply));
        host::Receive(connection, buffer.data(), reply.size);
    }
    if (reply.size <= state.range(0)) {
        state.SkipWithError("no reply");
    }
}
BENCHMARK(RunBaseline)->Name("RunCmdParms/baseline")->Apply(EachReply);

void PrintfTpd(State& state) {
    for (auto _ : state) {
        gSysLog.Printf(LOG_INFO, "std::string TpdClient::RunCmd(const char*, const char*)", 120,
                       "%s %d", "failed", 7);
    }
}
BENCHMARK(PrintfTpd)->Name("Printf, written/tpd");

void PrintfBaseline(State& state) {
    for (auto _ : state) {
        __android_log_print(ANDROID_LOG_INFO, "corvane_daemon", "%s[%d] %s %d", "TpdClient::RunCmd",
                            120, "failed", 7);
    }
}
BENCHMARK(PrintfBaseline)->Name("Printf, written/baseline");

void PrintfFiltered(State& state) {
    for (auto _ : state) {
        gSysLog.Printf(LOG_DEBUG, "RunCmd", 120, "failed");
    }
}
BENCHMARK(PrintfFiltered)->Name("Printf, filtered/tpd");

// Keeps freed memory for the next reply, as the baseline keeps its buffer. Otherwise the loop would
// mainly measure how fast the kernel clears pages.
void KeepFreedMemory() {
    mallopt(M_MMAP_THRESHOLD, 2 * host::kMaxTransactionBytes);
    mallopt(M_TRIM_THRESHOLD, 8 * host::kMaxTransactionBytes);
}

}  // namespace

int main(int argc, char** argv) {
    KeepFreedMemory();
    host::PublishService(kDriver, kServiceName, new Service);
    __system_property_set(kKey, "true");
    benchmark::Initialize(&argc, argv);
    return benchmark::RunSpecifiedBenchmarks() > 0 ? 0 : 1;
}
