"""What is shipped beside the program, and what must agree with it"""
import json
import re
import subprocess

import pytest

from virtual_device import PERMISSIVE, SERVICE, SOURCE, wait_until


def output(*command):
    return subprocess.run(command, check=True, capture_output=True, text=True).stdout


def source(path):
    return (SOURCE / path).read_text()


def bash_completions(build, *words):
    script = (
        '. "$0"; COMP_WORDS=(tpd "$@"); COMP_CWORD=$#; _tpd;'
        'printf "%s\\n" "${COMPREPLY[@]}"'
    )
    return output("bash", "-c", script, f"{build}/completions/tpd.bash", *words).split()


def zsh_completions(build, *words):
    script = (
        "_describe() { print -l ${${(P)4}%%:*} }; compadd() { print -l $@ };"
        'fpath=($0); autoload -U _tpd; words=(tpd "$@"); CURRENT=$#words; _tpd'
    )
    offered = output("zsh", "-f", "-c", script, f"{build}/completions", *words).split()
    return [word for word in offered if word.startswith(words[-1])]


SHELLS = pytest.mark.parametrize(
    "completions", [bash_completions, zsh_completions], ids=["bash", "zsh"]
)


@SHELLS
def test_completes_the_commands_of_the_help(device, build, completions):
    commands = re.findall(r"^\w+$", device.tpd("help"), re.M)
    assert sorted(completions(build, "")) == sorted(commands)


@SHELLS
def test_completes_parameters(build, completions):
    modes = ["running_test", "running_test_lasttime"]
    assert completions(build, "captest", "r") == modes
    assert completions(build, "TSA_ExecuteCommand", "captest", "r") == modes
    assert completions(build, "TSA_ExecuteCommand", "THP_SetA") == ["THP_SetAccData"]
    assert completions(build, "stop", "") == []


def test_completes_all_that_the_tool_sends_one_way():
    client = source("binder/corvane_sys_binder_client.cpp")
    names = re.search(r"g_asyncThpCmds = {(.*?)}", client, re.S)[1]
    completed = source("completions/daemon_commands")
    assert re.findall(r'"(\w+)"', names) == re.findall(r"^THP_\w+", completed, re.M)


def test_renders_the_manual_page(build):
    page = ["groff", "-man", "-Tutf8", "-ww", "-rLL=80n", build / "docs/tpd.1"]
    done = subprocess.run(page, check=True, capture_output=True, text=True)
    assert done.stderr == ""
    assert "debug and control" in done.stdout


def page_section(title):
    return re.search(rf"^\.SH {title}\n(.*?)^\.SH", source("docs/tpd.1"), re.S | re.M)[1]


def local_commands(device):
    return device.tpd("help").split("//aaa special gTpdCmds\n")[1].split()


def test_describes_all_local_commands(device):
    described = re.findall(r"^\.TP\n\.B (\w+)$", page_section("LOCAL COMMANDS"), re.M)
    assert sorted(described) == local_commands(device)


def use_all_properties(device):
    device.setprop(PERMISSIVE, "")
    device.output("setenforce", "0")
    device.tpd("captest", "version:3+main")
    (device.root / SERVICE).unlink()
    device.tpd("captest")
    device.setprop("odm.thp.dae_bootflag", "false")
    for command in [*local_commands(device), "log_enable", "log_disable", "stop"]:
        device.tpd(command)
    wait_until(lambda: not device.is_up())
    device.tpd("captest")


def test_names_all_properties(device):
    use_all_properties(device)
    read = {event["name"] for event in device.events("property_read", who="tpd")}
    written = {key for key, _ in device.written()}
    named_read, named_written = (
        set(re.findall(r"^(?:\.B |\\fB)([a-z_]+\.[a-z_.]+)", part, re.M))
        for part in page_section("PROPERTIES").split("Written, by")
    )
    assert written == named_written
    assert read == named_read | named_written


def test_builds_the_same_sources_for_a_device(build):
    for_device = set(re.findall(r'"(\w+/\w+\.cpp)"', source("Android.bp")))
    product = re.compile(r" -o (bounded_libc/)?CMakeFiles/(tpd\w*|bounded_libc)\.dir/")
    here = {
        each["file"].removeprefix(f"{SOURCE}/")
        for each in json.loads((build / "compile_commands.json").read_text())
        if product.search(each["command"])
    }
    assert here == for_device


def test_installs(build, tmp_path):
    output("cmake", "--install", build, "--prefix", tmp_path)
    files = [str(file.relative_to(tmp_path)) for file in tmp_path.rglob("*") if file.is_file()]
    assert sorted(files) == [
        "bin/tpd",
        "share/bash-completion/completions/tpd",
        "share/man/man1/tpd.1",
        "share/zsh/vendor-completions/_tpd",
    ]


def fenced(text):
    """The first fenced block of a page's text."""
    return re.search(r"^```\w*\n(.*?)^```", text, re.S | re.M)[1]


def is_at_rest(device):
    is_enabled = device.getprop("odm.thp.service_enable") == "1"
    return device.is_up() == is_enabled or not device.processes("/init")


def test_replays_the_session_of_the_readme(stopped_device):
    session = fenced(source("README.md"))
    for step in session.removeprefix("$ ").split("\n$ "):
        command, _, expected = step.partition("\n")
        stdout = stopped_device.output("bash", "-c", command, cwd=SOURCE)
        assert stdout.rstrip("\n") == expected.rstrip("\n"), command
        wait_until(lambda: is_at_rest(stopped_device))


def test_runs_the_ci_example(stopped_device):
    example = fenced(source("docs/automation.md").split("<!-- ci-example -->\n")[1])
    stopped_device.output("bash", "-c", example, cwd=SOURCE)
