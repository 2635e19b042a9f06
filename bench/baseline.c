// The baseline makes the tool's system calls, in the same order and with the same data, and does
// nothing else.
//   baseline THP_ResetBaseline   forwards the command, or refuses it while SELinux is enforcing
//   baseline debugRawEnable      sets a property
#define _GNU_SOURCE
#include <fcntl.h>
#include <signal.h>
#include <stdbool.h>
#include <stdint.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <time.h>
#include <unistd.h>

#define COMMAND "THP_ResetBaseline"
#define DESCRIPTOR u"android.CorvaneInterfaceServer.ICorvaneInterfaceService"
#define DEBUG_RAW "properties/thp.debug.raw"
#define REBOOT_TIMES "properties/odm.thp.dae_reboot_times"
#define REFUSAL "please exe 'adb shell setenforce 0' in g_tpdCmd to disable selinux\n\n"

enum { kMaxValue = 91, kMaxLogText = 1023, kMaxLine = 8192, kBlock = 4096, kInfo = 4, kError = 6 };
enum { kFile = O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC };

static int root;
static int logFile;
static char value[kMaxValue + 1];
static struct stat status;

__attribute__((noreturn)) static void Fail(const char* what) {
    perror(what);
    _exit(1);
}

static void WriteAll(int file, const char* text, size_t size) {
    if (write(file, text, size) != (ssize_t)size) {
        Fail("write");
    }
}

// Appends an event to the log. The bytes are those of platform/events.cpp.
static void Log(int priority, const char* tag, const char* text) {
    struct timespec now;
    char line[kMaxLine];
    clock_gettime(CLOCK_REALTIME, &now);
    char* end = line + sprintf(line,
                               "{\"time\":%jd.%06ld,\"pid\":%d,\"tid\":%d,\"who\":\"tpd\","
                               "\"what\":\"log\",\"priority\":%d,\"tag\":\"%s\",\"text\":\"",
                               (intmax_t)now.tv_sec, now.tv_nsec / 1000, getpid(), gettid(),
                               priority, tag);
    for (; *text != '\0'; ++text) {
        const bool isPlain = *text >= ' ' && *text <= '~' && *text != '"' && *text != '\\';
        const bool isQuoted = *text == '"' || *text == '\\';
        end += sprintf(end, isPlain ? "%c" : isQuoted ? "\\%c" : "\\u%04x", (unsigned char)*text);
    }
    end += sprintf(end, "\"}\n");
    WriteAll(logFile, line, (size_t)(end - line));
}

static void ReadProperty(const char* path) {
    const int file = openat(root, path, O_RDONLY | kFile);
    const ssize_t size = read(file, value, kMaxValue);
    if (size < 0) {
        Fail(path);
    }
    close(file);
    value[size] = '\0';
}

static void WriteProperty(const char* path, const char* text) {
    char temporary[64];
    fstatat(root, path, &status, AT_SYMLINK_NOFOLLOW);
    mkdirat(root, "tmp", 0700);
    mkdirat(root, "properties", 0700);
    snprintf(temporary, sizeof(temporary), "tmp/%d.0", getpid());
    const int file = openat(root, temporary, O_WRONLY | O_CREAT | O_TRUNC | kFile, 0600);
    WriteAll(file, text, strlen(text));
    close(file);
    if (renameat2(root, temporary, root, path, 0) != 0) {
        Fail(path);
    }
}

static void ReadKernelCommandLine(void) {
    char line[kBlock];
    openat(root, "proc/cmdline", O_RDONLY | kFile);  // does not exist
    const int file = open("/proc/cmdline", O_RDONLY);
    fstat(file, &status);
    if (read(file, line, (size_t)status.st_blksize) < 0) {
        Fail("/proc/cmdline");
    }
    close(file);
}

static void Start(void) {
    close(open("/dev/null", O_RDWR));
    umask(077);
    signal(SIGXFSZ, SIG_IGN);
    root = open(getenv("TPD_DEVICE_ROOT"), O_PATH | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC);
    fstat(root, &status);
    geteuid();
    fstatat(root, ".tpd-device", &status, AT_SYMLINK_NOFOLLOW);
    logFile = openat(root, "log", O_WRONLY | O_APPEND | O_CREAT | kFile, 0600);
    fstat(logFile, &status);
    openat(root, "trace", O_RDONLY | kFile);
    Log(kInfo, "corvane_daemon", "InitTpdCmds[120] +\n");
    Log(kInfo, "corvane_daemon", "ExcuteTpdCmd[142] +\n");
}

static const struct {
    uint32_t header[3];  // code, flags, size
    int32_t token[4];
    uint16_t descriptor[sizeof(DESCRIPTOR) / 2];
    char command[sizeof(COMMAND) + 1];  // padded to four bytes
    int32_t hasParameters;
} request = {{0, 0x10, sizeof(request) - sizeof(request.header)},
             {INT32_MIN, -1, 'V' << 24 | 'N' << 16 | 'D' << 8 | 'R', sizeof(DESCRIPTOR) / 2 - 1},
             DESCRIPTOR,
             COMMAND,
             0};

static int Connect(void) {
    struct sockaddr_un address = {AF_UNIX, ""};
    snprintf(address.sun_path, sizeof(address.sun_path),
             "/proc/self/fd/%d/dev/vndbinder/service.corvaneinterfaceservice", root);
    const int connection = socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0);
    if (connect(connection, (struct sockaddr*)&address, sizeof(address)) != 0) {
        Fail("connect");
    }
    fcntl(connection, F_SETFL, 0);
    return connection;
}

static char* Call(int connection) {
    uint32_t reply[3];  // status, flags, size
    if (send(connection, &request, sizeof(request), MSG_NOSIGNAL) < 0 ||
        recv(connection, reply, sizeof(reply), MSG_WAITALL) != sizeof(reply)) {
        Fail("call");
    }
    char* const text = malloc(reply[2]);
    if (recv(connection, text, reply[2], MSG_WAITALL) != reply[2]) {
        Fail("reply");
    }
    return text;
}

static void BeginOutput(void) {
    signal(SIGPIPE, SIG_IGN);
    fstat(STDOUT_FILENO, &status);
}

// Writes as a buffered stream does: whole blocks at once, the rest on exit.
static void Print(int connection, char* text) {
    BeginOutput();
    const size_t size = strlen(text);
    const size_t whole = size / kBlock * kBlock;
    if (whole > 0) {
        WriteAll(STDOUT_FILENO, text, whole);
    }
    close(connection);
    text[size] = '\n';
    WriteAll(STDOUT_FILENO, text + whole, size + 1 - whole);
}

static void Refuse(void) {
    FILE* const output = popen("getenforce", "r");
    char mode[16];
    if (output == NULL || fscanf(output, "%15s", mode) != 1 || pclose(output) != 0) {
        Fail("getenforce");
    }
    BeginOutput();
    WriteAll(STDOUT_FILENO, REFUSAL, sizeof(REFUSAL) - 1);
}

static void Forward(void) {
    Log(kInfo, "corvane_daemon", "ExcuteTpdCmd[150] -\n");
    Log(kInfo, "corvane_daemon", "corvane_daemon ThpDebugExecuteCmd[156] cmd " COMMAND "\n");
    ReadKernelCommandLine();
    ReadProperty("properties/odm.thp.debug.selinux.permissive");
    if (strcmp(value, "true") != 0) {
        Refuse();
        return;
    }
    ReadProperty("properties/odm.thp.dae_alive");
    ReadProperty("properties/odm.thp.binder");
    ReadProperty(REBOOT_TIMES);
    Log(kInfo, "tpd", "ThpGetBinder");
    const int connection = Connect();
    Log(kError, "tpd", "enter");
    Log(kError, "tpd", "ThpGetBinder ret = 0");
    char* const text = Call(connection);
    ReadProperty(REBOOT_TIMES);
    char line[kMaxLogText + 1] = "ret = ";
    strncat(line, text, sizeof(line) - sizeof("ret = "));
    Log(kInfo, "corvane_daemon", line);
    Print(connection, text);
}

static void DebugRawEnable(void) {
    Log(kInfo, "corvane_daemon", "ExcuteTpdCmd[145] Get cmd. debugRawEnable\n");
    ReadProperty(DEBUG_RAW);
    WriteProperty(DEBUG_RAW, "true");
    Log(kError, "corvane_daemon", "retry:1, i = 0, thp.debug.raw, [new]true, [old]false");
    usleep(100);
    ReadProperty(DEBUG_RAW);
    BeginOutput();
    WriteAll(STDOUT_FILENO, "\n", 1);
}

int main(int argc, char** argv) {
    Start();
    if (argc == 2 && strcmp(argv[1], "debugRawEnable") == 0) {
        DebugRawEnable();
    } else {
        Forward();
    }
    _exit(0);
}
