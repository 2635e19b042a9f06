"""The files shipped with the program, and their agreement with it"""
import re
import subprocess

import pytest

from virtual_device import SOURCE, wait_until

COMPLETIONS = {
    "bash": """
. ./tpd.bash
COMP_WORDS=(tpd "$@") COMP_CWORD=$#
_tpd
echo "${COMPREPLY[@]}"
""",
    "zsh": """
_describe() { echo ${${(P)4}%%:*} }
compadd() { echo $@ }
fpath=(.) words=(tpd "$@") CURRENT=$#words
autoload -U _tpd
_tpd
""",
}


def source(path):
    return (SOURCE / path).read_text()


@pytest.fixture(params=COMPLETIONS)
def complete(request, build):
    """The shell's completions of an empty last argument."""
    script = COMPLETIONS[request.param]
    shell = [request.param, "-f", "-c", script, "complete"]
    path = build / "completions"
    return lambda *words: subprocess.check_output([*shell, *words], cwd=path, text=True).split()


def test_completes_the_commands_in_the_help(device, complete):
    commands = re.findall(r"^\w+$", device.tpd("help"), re.M)
    assert sorted(complete("")) == sorted(commands)


def test_completes_parameters(complete):
    modes = ["running_test", "running_test_lasttime"]
    assert complete("captest", "") == modes
    assert complete("TSA_ExecuteCommand", "captest", "") == modes
    assert "THP_SetAccData" in complete("TSA_ExecuteCommand", "")
    assert complete("stop", "") == []


@pytest.fixture
def manual(build):
    """The manual page as man shows it"""
    page = ["groff", "-man", "-Tascii", "-P-cbou", "-ww", "-rLL=80n", build / "docs/tpd.1"]
    done = subprocess.run(page, check=True, capture_output=True, text=True)
    assert done.stderr == ""
    return done.stdout


def test_manual_describes_the_local_commands(device, manual):
    listed = device.tpd("help").split("//aaa special gTpdCmds\n")[1].split()
    section = manual.partition("LOCAL COMMANDS\n")[2].partition("\nFORWARDED")[0]
    entries = section.partition("\n\n")[2]
    described = re.findall(r"^ {7}(\w+)", entries, re.M)
    assert sorted(described) == listed


def test_builds_the_same_sources_for_a_device():
    directories = "binder bounded_libc cmdline daemon log main property".split()
    for_device = re.findall(r'"(\w+/\w+\.cpp)"', source("Android.bp"))
    here = [str(path.relative_to(SOURCE)) for path in SOURCE.glob("*/*.cpp")]
    assert sorted(for_device) == sorted(path for path in here if path.split("/")[0] in directories)


def fenced(text):
    """The first fenced block of a page's text."""
    return re.search(r"^```\w*\n(.*?)^```", text, re.S | re.M)[1]


def is_idle(device):
    is_enabled = device.getprop("odm.thp.service_enable") == "1"
    return device.is_up() == is_enabled or not device.processes("/init")


def run_in_source(device, script):
    return device.output("bash", "-c", script, cwd=SOURCE)


def test_replays_the_session_of_the_readme(stopped_device):
    session = fenced(source("README.md"))
    for step in session.removeprefix("$ ").split("\n$ "):
        command, _, expected = step.partition("\n")
        stdout = run_in_source(stopped_device, command)
        assert stdout.rstrip("\n") == expected.rstrip("\n"), command
        wait_until(lambda: is_idle(stopped_device))


def test_runs_the_ci_example(stopped_device):
    page = source("docs/automation.md")
    example = page.partition("<!-- ci-example -->\n")[2]
    done = stopped_device.run("bash", "-xc", fenced(example), cwd=SOURCE)
    assert done.returncode == 0, done.stderr


def test_client_passes_any_argument_unchanged(device):
    argument = "it's  $HOME\n`x`"
    script = '. client/tpd.sh; tpd_send captest "$1"; printf %s "$TPD_RESULT"'
    answer = device.output("sh", "-c", script, "sh", argument, cwd=SOURCE)
    assert answer == f"captest {argument}: PASS"
