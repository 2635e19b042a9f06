"""The shipped tool on virtual devices: tables of cases, each on a device of its own"""
import collections, concurrent.futures, contextlib, itertools, os, pathlib, re, shutil
import socket, struct, subprocess, sys, tempfile, threading, time

SOURCE = pathlib.Path(__file__).resolve().parent.parent
BUILD = pathlib.Path(os.environ.get("TPD_BUILD_DIR", SOURCE / "build")).resolve()
BASE = tempfile.TemporaryDirectory(prefix="tpd-")
SERVICE, SLACK_S = "dev/vndbinder/service.corvaneinterfaceservice", 4
REAL, HANG, GONE, UNREAD = "the daemon", "never answers", "withdrawn for good", "hangs up unread"
TIMEOUT = ("corvane_daemon binder server execute command return ERROR, may caused by processing "
           "timeout.\n")
REFUSED = "please exe 'adb shell setenforce 0' in g_tpdCmd to disable selinux\n\n"
NO_SERVICE, RESET = "0F_1F; failed to get binder service\n", "service_enable=0 service_enable=1"
# fake: a shell command of that name. when: done once the log holds that. put: unseen by init.
VERBS = """R=$TPD_DEVICE_ROOT; P=$R/properties; export R P
fake() { printf '#!/bin/sh\\n%s\\n' "$2" >bin/$1; chmod +x bin/$1; }
when() { (while ! grep -q "$1" $R/log; do sleep .01; done; shift; "$@") >/dev/null 2>&1 & }
put() { printf "$2" >$P/$1; }\n"""
SCRIPTED = """mkdir -p $P tmp bin proc dev/vndbinder; echo Permissive >selinux
for i in dae_alive=true binder=1 dae_reboot_times=0 is_updating_fw=false dae_bootflag=true \\
    service_enable=1 debug.selinux.permissive=true; do put odm.thp.${i%=*} ${i#*=}; done\n"""


def shell(root, words):
    path = f"{root}/bin:{SOURCE}/device/bin:{SOURCE}/scripts:{BUILD}:{os.environ['PATH']}"
    env = os.environ | {"PATH": path, "TPD_DEVICE_ROOT": str(root), "TPD_BUILD_DIR": str(BUILD)}
    return subprocess.run(["sh", "-c", VERBS + words], capture_output=True, encoding="latin-1",
                          timeout=90, cwd=root, env=env | {"TPD_GET_SERVICE_MS": "300"})


def serve(listener, root, replies):
    for reply in itertools.chain(replies, itertools.repeat(replies[-1])):
        with listener.accept()[0] as client, contextlib.suppress(OSError):
            if reply == GONE:
                return (root / SERVICE).unlink(), listener.close()
            if reply != UNREAD:
                size = struct.unpack("<8xI", client.recv(12, socket.MSG_WAITALL))[0]
                client.recv(size, socket.MSG_WAITALL)
                client.recv(1) if reply == HANG else client.sendall(reply)


def run(row):
    replies, given, typed, printed, trail, *wait = row
    root = pathlib.Path(tempfile.mkdtemp(dir=BASE.name))
    shell(root, ("device start; setprop odm.thp.debug.selinux.permissive true\n" if replies == REAL
                 else SCRIPTED) + given + "\n: >$R/log")
    if replies and replies != REAL:
        listener = socket.socket(socket.AF_UNIX)
        listener.bind(str(root / SERVICE))
        listener.listen()
        threading.Thread(target=serve, args=(listener, root, replies), daemon=True).start()
    begin = time.monotonic()
    done, took = shell(root, typed), time.monotonic() - begin
    found = re.findall(r"(\S+), \[new\](.*), \[old\]|(CheckAlive|(?<=Binder, )failed|retry =)",
                       (root / "log").read_text("latin-1"))
    steps = collections.Counter(step or f"{key.replace('odm.thp.', '')}={value}"
                                for key, value, step in found)
    got = " ".join(step + f"*{count}" * (count > 1) for step, count in steps.items())
    result = (done.stdout.replace(str(root), "ROOT"), got, done.returncode,
              shell(root, "device stop; ls tmp").stdout)
    good = result == (printed, trail, 0, "") and sum(wait) <= took < sum(wait) + SLACK_S
    shutil.rmtree(root)
    case, expected = f"{replies!r:.40} {given + ' ' + typed!r:.150}", (printed, trail, 0)
    return (f"{'holds' if good else 'FAILS'} | {case} | {expected!r:.120} | {result!r:.120} | "
            f"{took:.2f} s")


def campaign(rows, rounds=1):
    tries, held = rows * rounds, 0
    print("result | case | expected: text, steps, status | got, and files left | time")
    with concurrent.futures.ThreadPoolExecutor(8) as pool:
        for line in pool.map(run, tries):
            print(line)
            held += line.startswith("holds")
    print(f"{len(rows)} cases, {held} of {len(tries)} runs hold")
    sys.exit(held < len(tries))
