// The floor under the tool: its system calls in its order with its bytes, and nothing else.
//   floor COMMAND   what `tpd COMMAND` does, forwarded or refused as the stored flag says
//   floor           what `tpd stop` does
#define _GNU_SOURCE
#include <fcntl.h>
#include <signal.h>
#include <stdint.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <sys/uio.h>
#include <sys/un.h>
#include <unistd.h>

#define HEAD "01-01 00:00:00.000 00000 00000 "
#define TAGGED(letter) HEAD letter " corvane_daemon: "
#define UNTAGGED(letter) HEAD letter " tpd: "
#define DESCRIPTOR u"android.CorvaneInterfaceServer.ICorvaneInterfaceService"
#define PERMISSIVE "properties/odm.thp.debug.selinux.permissive"
#define SERVICE_ENABLE "properties/odm.thp.service_enable"
#define REBOOT_TIMES "properties/odm.thp.dae_reboot_times"
#define REFUSAL "please exe 'adb shell setenforce 0' in g_tpdCmd to disable selinux\n\n"

enum { kMaxValue = 91, kMaxEntry = 1023, kBlock = 4096 };

static int root;
static int logFile;
static char value[kMaxValue + 1];
static struct stat status;

static void WriteAll(int file, const char* text, size_t size) {
    if (write(file, text, size) != (ssize_t)size) {
        _exit(1);
    }
}

static void Log(const char* head, const char* text, size_t size) {
    char entry[kMaxEntry + 64];
    const size_t headSize = strlen(head);
    const size_t cut = size < kMaxEntry ? size : kMaxEntry;
    memcpy(entry, head, headSize);
    memcpy(entry + headSize, text, cut);
    entry[headSize + cut] = '\n';
    syscall(SYS_gettid);
    getpid();
    WriteAll(logFile, entry, headSize + cut + 1);
}

static void Note(const char* head, const char* text) { Log(head, text, strlen(text)); }

static void ReadProperty(const char* path) {
    const int file = openat(root, path, O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC);
    const ssize_t size = read(file, value, kMaxValue);
    close(file);
    value[size > 0 ? size : 0] = '\0';
}

static void WriteProperty(const char* path, const char* text) {
    char temporary[64];
    fstatat(root, path, &status, AT_SYMLINK_NOFOLLOW);
    snprintf(temporary, sizeof(temporary), "tmp/%d.0", getpid());
    const int file =
            openat(root, temporary, O_WRONLY | O_CREAT | O_TRUNC | O_NOFOLLOW | O_CLOEXEC, 0600);
    WriteAll(file, text, strlen(text));
    close(file);
    renameat2(root, temporary, root, path, 0);
}

static void ReadCommandLine(void) {
    char line[kBlock];
    int file = openat(root, "proc/cmdline", O_RDONLY | O_NONBLOCK | O_CLOEXEC);
    if (file < 0) {
        file = open("/proc/cmdline", O_RDONLY);
    } else {
        fcntl(file, F_GETFL);
    }
    fstat(file, &status);
    if (read(file, line, status.st_blksize) < 0) {
        _exit(1);
    }
    close(file);
}

static void Start(void) {
    close(open("/dev/null", O_RDWR));
    root = open(getenv("TPD_DEVICE_ROOT"), O_PATH | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC);
    fstat(root, &status);
    geteuid();
    logFile = openat(root, "log",
                     O_WRONLY | O_APPEND | O_CREAT | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC, 0600);
    Note(TAGGED("I"), "InitTpdCmds[120] +");
    Note(TAGGED("I"), "ExcuteTpdCmd[142] +");
}

static int Connect(void) {
    struct sockaddr_un address = {AF_UNIX, ""};
    struct ucred peer;
    socklen_t size = sizeof(peer);
    snprintf(address.sun_path, sizeof(address.sun_path),
             "/proc/self/fd/%d/dev/vndbinder/service.corvaneinterfaceservice", root);
    const int connection = socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0);
    if (connect(connection, (struct sockaddr*)&address, sizeof(address)) != 0) {
        _exit(1);
    }
    getsockopt(connection, SOL_SOCKET, SO_PEERCRED, &peer, &size);
    geteuid();
    return connection;
}

// The answer's text without its terminator; `size` is its length.
static char* Call(int connection, const char* command, size_t* size) {
    static const int32_t token[] = {INT32_MIN, -1, 'V' << 24 | 'N' << 16 | 'D' << 8 | 'R',
                                    sizeof(DESCRIPTOR) / 2 - 1};
    char body[512] = {0};
    memcpy(body, token, sizeof(token));
    memcpy(body + sizeof(token), DESCRIPTOR, sizeof(DESCRIPTOR));
    size_t end = sizeof(token) + sizeof(DESCRIPTOR);
    memcpy(body + end, command, strlen(command));
    end += ((strlen(command) + 4) & ~(size_t)3) + sizeof(int32_t);

    const uint32_t request[] = {0, 0x10, (uint32_t)end};
    struct iovec parts[] = {{(void*)request, sizeof(request)}, {body, end}};
    struct msghdr message = {.msg_iov = parts, .msg_iovlen = 2};
    uint32_t reply[2];
    if (sendmsg(connection, &message, MSG_NOSIGNAL) < 0 ||
        recv(connection, reply, sizeof(reply), MSG_WAITALL) != sizeof(reply)) {
        _exit(1);
    }
    char* const text = malloc(reply[1]);
    for (size_t got = 0; got < reply[1];) {
        const ssize_t part = recv(connection, text + got, reply[1] - got, MSG_WAITALL);
        if (part <= 0) {
            _exit(1);
        }
        got += part;
    }
    *size = strlen(text);
    return text;
}

// As a buffered stream writes it: whole blocks at once, the rest when the program ends.
static void Print(int connection, char* text, size_t size) {
    signal(SIGPIPE, SIG_IGN);
    fstat(STDOUT_FILENO, &status);
    const size_t whole = size / kBlock * kBlock;
    if (whole > 0) {
        WriteAll(STDOUT_FILENO, text, whole);
    }
    close(connection);
    text[size] = '\n';
    WriteAll(STDOUT_FILENO, text + whole, size + 1 - whole);
}

static void Forward(const char* command) {
    Note(TAGGED("I"), "ExcuteTpdCmd[150] -");
    char line[128];
    snprintf(line, sizeof(line), "corvane_daemon ThpDebugExecuteCmd[156] cmd %s", command);
    Note(TAGGED("I"), line);
    ReadCommandLine();
    ReadProperty(PERMISSIVE);
    if (strcmp(value, "true") != 0) {
        FILE* const output = popen("getenforce", "r");
        char mode[16];
        if (fscanf(output, "%15s", mode) == 1 && pclose(output) == 0) {
            signal(SIGPIPE, SIG_IGN);
            fstat(STDOUT_FILENO, &status);
            WriteAll(STDOUT_FILENO, REFUSAL, sizeof(REFUSAL) - 1);
        }
        return;
    }
    ReadProperty("properties/odm.thp.dae_alive");
    ReadProperty("properties/odm.thp.binder");
    ReadProperty(REBOOT_TIMES);
    Note(UNTAGGED("I"), "ThpGetBinder");
    const int connection = Connect();
    Note(UNTAGGED("E"), "enter");
    Note(UNTAGGED("E"), "ThpGetBinder ret = 0");
    size_t size;
    char* const text = Call(connection, command, &size);
    ReadProperty(REBOOT_TIMES);
    // The line's text begins with six more bytes, which count among those of an entry.
    Log(TAGGED("I") "ret = ", text, size < kMaxEntry - 6 ? size : kMaxEntry - 6);
    Print(connection, text, size);
}

static void Stop(void) {
    Note(TAGGED("I"), "ExcuteTpdCmd[145] Get cmd. stop");
    ReadProperty(SERVICE_ENABLE);
    WriteProperty(SERVICE_ENABLE, "0");
    Note(TAGGED("E"), "retry:1, i = 0, odm.thp.service_enable, [new]0, [old]1");
    usleep(100);
    ReadProperty(SERVICE_ENABLE);
    signal(SIGPIPE, SIG_IGN);
    fstat(STDOUT_FILENO, &status);
    WriteAll(STDOUT_FILENO, "\n", 1);
}

int main(int argc, char** argv) {
    Start();
    if (argc == 2) {
        Forward(argv[1]);
    } else {
        Stop();
    }
    _exit(0);
}
