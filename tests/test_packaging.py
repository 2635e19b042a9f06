"""The packages, completions, manuals and pages"""
import itertools
import re
import stat
import subprocess

import pytest

from virtual_device import NO_SERVICE, PASS, RESTART, SOURCE, free_port, wait_until

COMPLETIONS = {
    "bash": """
. usr/share/bash-completion/completions/tpd-device
COMP_WORDS=("$@") COMP_CWORD=$(($# - 1)) COMP_LINE=$* COMP_POINT=${#COMP_LINE}
_${1//-/_} "$1" "${!#}"
printf '%s\\n' "${COMPREPLY[@]}"
""",
    "zsh": """
_describe() { print -rl -- ${${(P)4}%%:*} }
compadd() { print -rl -- $@ }
fpath=(usr/share/zsh/vendor-completions) words=("$@") CURRENT=$#words
autoload -U _tpd _tpd-device
_$1
""",
}


def source(path):
    return (SOURCE / path).read_text()


@pytest.fixture(scope="session")
def installed(build, tmp_path_factory):
    """A directory into which both packages are unpacked"""
    directory = tmp_path_factory.mktemp("packages")
    root = directory / "root"
    config = build / "CPackConfig.cmake"
    cpack = ["cpack", "-G", "DEB", "--config", config, "-B", directory]
    subprocess.check_output(cpack, umask=0o077)
    for package in directory.glob("*.deb"):
        subprocess.check_call(["dpkg-deb", "-x", package, root])
    for name in ["timeout", "toybox"]:  # targets of relative links
        (root / "usr/bin" / name).symlink_to(f"/usr/bin/{name}")
    return root


@pytest.fixture
def installed_device(installed, stopped_device):
    """A device that uses the unpacked packages"""
    env = stopped_device.env
    env["PATH"] = f"{installed}/usr/bin:{env['PATH']}"
    return stopped_device


def test_file_modes_do_not_depend_on_the_umask(installed):
    files = (installed / "usr").rglob("*")
    modes = {stat.filemode(file.lstat().st_mode) for file in files}
    assert modes == {"drwxr-xr-x", "-rw-r--r--", "-rwxr-xr-x", "lrwxrwxrwx"}


def test_version_is_that_of_the_package(installed, installed_device):
    (package,) = installed.parent.glob("tpd-device_*.deb")
    version = package.name.split("_")[1]
    assert installed_device.output("tpd-device", "--version") == f"tpd-device {version}\n"


@pytest.fixture(params=COMPLETIONS)
def complete(request, installed, installed_device):
    """Returns the shell's completions of the last word"""
    shell = request.param, "-f", "-c", COMPLETIONS[request.param]

    def last_word(*words):
        command = [*shell, "complete", *words]
        return installed_device.output(*command, cwd=installed).split()

    return last_word


def test_completes_the_commands_in_the_help(device, complete):
    commands = set(re.findall(r"^\w+$", device.tpd("help"), re.M))
    assert set(complete("tpd", "")) == commands
    assert set(complete("tpd", "TSA_ExecuteCommand", "")) < commands


def test_completes_parameters(complete):
    modes = ["running_test", "running_test_lasttime"]
    assert complete("tpd", "captest", "") == modes
    assert complete("tpd-device", "run", "TSA_ExecuteCommand", "captest", "") == modes
    assert complete("tpd-device", "trace", "--bytes", "captest", "") == modes
    assert complete("tpd", "stop", "") == []


def test_completes_tpd_device(device, complete):
    verbs = re.findall(r"^ +device (\w+)", device.output("device", "--help"), re.M)
    assert set(complete("tpd-device", "")) == set(verbs)
    assert complete("tpd-device", "start", "") == ["--permissive"]
    faults = re.findall(r"^\w+", device.output("device", "fault"), re.M)
    assert set(complete("tpd-device", "fault", "")) == set(faults)


INTERACTIVE = {
    "bash --norc": ". usr/share/bash-completion/completions/tpd-device\n",
    "zsh -f": """
fpath=(usr/share/zsh/vendor-completions $fpath); autoload -U compinit; compinit -D
""",
}
# Commands with a recorded answer, and how the user begins to type them
BEGUN = {
    "a $(touch X) 'b'": "'a $(",
    'c "$d" !e!': '"c ',
    "j:k\tl:m": "j:k",
    "~[n]*?#{o,p};&|<>": "\\~",
}


@pytest.mark.parametrize("shell", INTERACTIVE)
def test_completes_recorded_commands_as_the_user_quotes_them(installed, installed_device, shell):
    for command in BEGUN:
        installed_device.answer(command, "text")
    lines = [f"tpd-device answer --remove {begun}\t\n" for begun in BEGUN.values()]
    session = "".join([INTERACTIVE[shell], *lines, "exit\n"])
    terminal = "script", "-qc", shell, "/dev/null"
    shown = installed_device.output(*terminal, cwd=installed, input=session)
    assert installed_device.answer() == "", shown
    assert not (installed / "X").exists()


def described(page, section):
    """Returns the names that a section of a manual page describes"""
    groff = "groff -man -Tascii -P-cbou -ww -rLL=80n".split()
    shown = subprocess.run([*groff, page], capture_output=True, text=True)
    assert (shown.returncode, shown.stderr) == (0, "")
    assert max(map(len, shown.stdout.splitlines())) <= 80
    pattern = rf"^{section}\n.*?\n\n(.*?)^[A-Z]"
    entries = re.search(pattern, shown.stdout, re.M | re.S)[1]
    return set(re.findall(r"^ {7}(\w+)", entries, re.M))


def test_manual_describes_the_local_commands(device, build):
    listed = device.tpd("help").split("//aaa special gTpdCmds\n")[1].split()
    assert described(build / "docs/tpd.1", "LOCAL COMMANDS") == set(listed)


def test_manual_describes_the_faults(stopped_device, build):
    listed = re.findall(r"^\w+", stopped_device.output("device", "fault"), re.M)
    assert set(listed) - described(build / "docs/tpd-device.1", "FAULTS") == set()


def test_android_bp_lists_the_sources_of_the_product():
    directories = "binder bounded_libc cmdline daemon log main property".split()
    listed = re.findall(r'"(\w+/\w+\.cpp)"', source("Android.bp"))
    paths = [path for name in directories for path in (SOURCE / name).glob("*.cpp")]
    assert set(listed) == {str(path.relative_to(SOURCE)) for path in paths}


def is_idle(device):
    is_enabled = device.getprop("odm.thp.service_enable") == "1"
    return device.is_up() == is_enabled or not device.processes("/init")


def steps(session):
    """Yields the commands of a session, which follow "$ ", and their output"""
    for step in session.removeprefix("$ ").split("\n$ "):
        lines = step.splitlines()
        count = 1 + sum(line.startswith("> ") for line in lines)
        command = [line.removeprefix("> ") for line in lines[:count]]
        yield "\n".join(command), "\n".join(lines[count:])


def replay(device, sessions, directory):
    """Runs the commands of all sessions in one shell and compares their output."""
    serials = {}  # the page's by the actual ones, which depend on the ports in use

    def serial(match):
        return serials.setdefault(match[0], f"emulator-{5554 + 2 * len(serials)}")

    pipes = {"stdin": subprocess.PIPE, "stdout": subprocess.PIPE, "text": True}
    with subprocess.Popen(["bash"], env=device.env, cwd=directory, **pipes) as bash:
        for command, expected in itertools.chain.from_iterable(map(steps, sessions)):
            bash.stdin.write("{ %s\n} </dev/null\necho; echo END\n" % command)
            bash.stdin.flush()
            lines = itertools.takewhile(lambda line: line != "END\n", bash.stdout)
            shown = re.sub(r"emulator-\d+", serial, "".join(lines))
            assert shown.rstrip("\n") == expected.rstrip("\n"), command
            wait_until(lambda: is_idle(device))


@pytest.fixture
def shared_port(installed_device):
    """The port of an adb server that does not look for the devices of other tests"""
    port = str(free_port())
    env = installed_device.env | {"ANDROID_ADB_SERVER_PORT": port, "ADB_EMU": "0"}
    installed_device.output("adb", "start-server", env=env)
    yield port
    installed_device.run("adb", "kill-server", env=env)


@pytest.mark.parametrize("page", ["README.md", "docs/automation.md"])
def test_replays_the_sessions_of_a_page(installed, installed_device, shared_port, tmp_path, page):
    text = source(page).replace("/usr/share/", f"{installed}/usr/share/")
    text = text.replace("PORT=5038", f"PORT={shared_port}")
    directory = SOURCE if page == "README.md" else tmp_path
    sessions = re.findall(r"^```\n(\$ .*?)^```", text, re.S | re.M)
    replay(installed_device, sessions, directory)


# For each example, a command to run after it, and what one of them prints
EXAMPLES = {
    "tpd.1": [
        ("getenforce", "Permissive"),
        ("", "THP_SetFoldState: done (1)\n"),
        ("", "THP_SetFoldState: done (1)\n"),
        ("", "\ntrue\n"),
        ("", "THP_Log_Commander: done (level 4)\n"),
    ],
    "tpd-device.1": [
        ("tpd captest", "0P_1P; bypass"),
        ("tpd captest", PASS),
        ("TPD_GET_SERVICE_MS=300 tpd captest", NO_SERVICE),
        ("tpd THP_SetFoldState 1", "folded\n"),
        ("", "//aaa special gTpdCmds"),
        ("", "init reaps corvane_daemon"),
    ],
}


@pytest.mark.parametrize("page", EXAMPLES)
def test_runs_the_examples_of_a_manual(installed, installed_device, build, page):
    text = (build / "docs" / page).read_text().replace(r"\-", "-")
    text = text.replace("/usr/", f"{installed}/usr/")
    blocks = re.findall(r"^\.nf\n(?:\.RS\n)?(.*?)^\.(?:RE|fi)", text, re.S | re.M)
    examples = [block for block in blocks if re.match("adb|export|tpd-device", block)]
    for example, (check, expected) in zip(examples, EXAMPLES[page], strict=True):
        installed_device.output("tpd-device", "reboot")
        installed_device.output("setenforce", "0")
        script = f'eval "$(tpd-device adb)"\n{example}'
        shown = installed_device.output("bash", "-ec", script)
        wait_until(lambda: expected in shown + installed_device.output("bash", "-c", check))


def test_runs_the_ci_example(installed, installed_device):
    page = source("docs/automation.md").replace("/usr/", f"{installed}/usr/")
    example = re.search(r"^```sh\n(.*?)^```", page, re.S | re.M)[1]
    done = installed_device.run("sh", "-xc", example)
    assert done.returncode == 0, done.stderr


CLIENT = """
. client/tpd.sh
reading() { cat >/dev/null; "$@"; }
ADB="reading device"
printf '%s\\n' 1 2 | while read -r x; do tpd_send captest "$x"; echo "$TPD_RESULT"; done
tpd_send captest "$1"; echo "$TPD_OUTCOME: $TPD_RESULT"
device fault hang 9000
TPD_LIMIT=1; tpd_send captest; echo "$TPD_OUTCOME, $?"
stop corvane_daemon
until [ "$(getprop init.svc.corvane_daemon)" = stopped ]; do sleep 0.1; done
tpd_wait 1; echo "$?"
ADB=false; tpd_send captest; echo "$TPD_OUTCOME"
"""


@pytest.mark.parametrize("shell", ["dash", "bash", "mksh", "zsh"])
def test_client_reports_outcomes(device, shell):
    argument = "it's  $HOME\n`x`"
    shown = device.output(shell, "-c", CLIENT, "sh", argument, cwd=SOURCE)
    sent = f"captest 1: PASS\ncaptest 2: PASS\nanswered: captest {argument}: PASS\n"
    assert shown == sent + "late, 1\n1\nbroken\n"
    assert set(RESTART) - set(device.written()) == set()
