"""load.py [COMMANDS]: 16 clients at once, in peace, then while the daemon is killed and switched"""
import collections, concurrent.futures, os, pathlib, random, re, sys, tempfile, time

from virtual_device import BASE, NO_SERVICE, TIMEOUT, shell

CLIENTS, GROWTH_KIB, COMMANDS = 16, 2048, int((sys.argv + ["10000"])[1])
ROOT, counts = pathlib.Path(tempfile.mkdtemp(dir=BASE.name)), collections.Counter()
OTHERS = re.compile(r"0P_1P; (bypass-when-fw-updating)?check_time: \d+\.thp.dae_alive : [01]\. thp."
                    f"binder: [01]( reboot_times: [01])?\n|{TIMEOUT}|{NO_SERVICE}")
TROUBLES = ("kill -9 $(pgrep -P $(cat init.pid))", "tpd reboot", "tpd stop; sleep 2.5; tpd start",
            "setprop odm.thp.dae_alive 0", "setprop sim.fault_count 9; setprop sim.fault die_after",
            "setprop sim.updating_fw true; sleep .5; setprop sim.updating_fw false")


def figures():
    found = shell(ROOT, "sleep .3; for p in $(cat init.pid) $(pgrep -P $(cat init.pid)); do "
                  "ls /proc/$p/fd | wc -l; awk '/VmRSS/ { print $2 }' /proc/$p/status; done").stdout
    return [int(figure) for figure in found.split()]


def client(phase, number):
    for turn in range(COMMANDS // CLIENTS // 2):
        if phase == "trouble" and random.random() < .02:
            shell(ROOT, random.choice(TROUBLES))
        word = f"{phase}{number}.{turn}." + "x" * random.randrange(20)
        params = f"version:3+main,{word},{word[::-1]}"
        killed = f"timeout -s KILL .00{random.randrange(1, 9)} " * (turn % 8 == 7)
        done = shell(ROOT, f"{killed}tpd THP_SetFoldState {params}")
        answered = done.stdout == f"THP_SetFoldState: fold state set ({params})\n"
        known = answered or OTHERS.fullmatch(done.stdout) and phase == "trouble"
        outcome = "killed" if killed else "WRONG " * (not known or done.returncode != 0) + (
            "answered" if answered else done.stdout[:27])
        counts[f"{phase}: {outcome}"] += 1
        word, mirrored = (ROOT / "properties/odm.thp.screen_status").read_text().split(",")[1:]
        counts["WRONG values"] += word != mirrored[::-1]
        if number == 0:
            kept = shell(ROOT, f"tpd debug{('Dif', 'Raw')[turn % 2]}Enable; getprop thp.debug.raw")
            counts["WRONG, lost values"] += kept.stdout != ("\nfalse\n", "\ntrue\n")[turn % 2]


shell(ROOT, "device start; setprop odm.thp.debug.selinux.permissive true; tpd x version:3+main,,")
for phase in ("peace", "trouble"):
    before, begin = list(figures()), time.monotonic()
    with concurrent.futures.ThreadPoolExecutor(CLIENTS) as pool:
        list(pool.map(client, [phase] * CLIENTS, range(CLIENTS)))
    took = time.monotonic() - begin
    shell(ROOT, "setprop sim.fault none; tpd reboot; until tpd captest | grep PASS; do :; done")
    after = list(figures())
    print(f"{phase}: {took:.1f} s; descriptors and KiB of init, daemon: {before}, then {after}")
    counts["WRONG growth"] += before[::2] != after[::2] or sum(after) > sum(before) + GROWTH_KIB
counts["WRONG files"] = len(shell(ROOT, "device stop; ls tmp; ls dev/vndbinder").stdout)
counts["WRONG processes"] = len(os.popen(f"grep -ls {ROOT} /proc/[0-9]*/environ").read())
print("\n".join(f"{what.strip()}: {count}" for what, count in sorted(counts.items())))
sys.exit(any(count for what, count in counts.items() if "WRONG" in what))
