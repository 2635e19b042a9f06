"""roads.py: each road that a command can take through the shipped tool on a virtual device"""
from virtual_device import NO_SERVICE, REAL, REFUSED, RESET, SOURCE, TIMEOUT, campaign

UP = "; until [ $(getprop odm.thp.binder) = 1 ]; do sleep .02; done"
AGAIN = "; until [ $(getprop odm.thp.dae_reboot_times) = 1 ]; do sleep .02; done" + UP
STATE = "; for i in dae_alive service_enable dae_reboot_times; do getprop odm.thp.$i; done"
OFF = "; until [ $(getprop odm.thp.binder) = 0 ]; do sleep .02; done"
PASS, FOLDED = "captest idle_test: PASS\n", "THP_SetFoldState: fold state set (1)\n"
DOWN = "0P_1P; check_time: 10.thp.dae_alive : 0. thp.binder: 0 reboot_times: 0\n"
BYPASS = "0P_1P; bypass-when-fw-updatingcheck_time: 0.thp.dae_alive : 0. thp.binder: 0\n"
LOCAL = ("debugDifEnable debugRawEnable log_afe_disable log_afe_enable log_disable log_enable "
         "reboot showtouch showtouch_close start stop\n")

# Words that set up, words typed and asked then, what is printed, what the tool writes and which of
# its steps fail, the seconds that it waits.
ROADS = (
    ("", "tpd THP_SetFoldState 1" + STATE, FOLDED + "true\n1\n0\n", ""),
    ("", "tpd stop now", "unknown command: stop\n", ""),
    ("", "tpd TSA_ExecuteCommand captest", PASS, ""),
    ("", "tpd TSA_ExecuteCommand THP_SetFoldState 1", FOLDED, ""),
    ("", "tpd TSA_ExecuteCommand '' x; tpd tsa_executecommand help x; tpd a b c d", "\n\n\n", ""),
    ("", "tpd | sed '1,/aaa/d' | xargs; tpd help | sed '1,/aaa/d' | xargs", LOCAL * 2, ""),
    ("", f"tpd help >x; grep -o '\"THP_[^\"]*' {SOURCE}/binder/*.cpp | tr -d '\"' | grep -cxFf x",
     "41\n", ""),  # the daemon knows every one-way name
    ("", "tpd help | head -n 2", "corvane_daemon commands:\nTHP_GetScreenState\n", ""),
    ("", "tpd THP_GetScreenState version:3+main,1; getprop odm.thp.screen_status",
     "screen state: version:3+main,1\nversion:3+main,1\n", "screen_status=version:3+main,1"),
    ("setprop odm.thp.debug.selinux.permissive null", "tpd captest", REFUSED, ""),
    ("setprop odm.thp.debug.selinux.permissive null", "setenforce 0; tpd captest; setenforce 1; "
     "tpd captest", PASS * 2, "debug.selinux.permissive=true"),
    ("", "tpd stop" + OFF + STATE, "\nfalse\n0\n0\n", "service_enable=0"),
    ("tpd stop" + OFF, "tpd start" + UP + STATE, "\ntrue\n1\n0\n", "service_enable=1"),
    ("", "tpd reboot; sleep .2" + UP + "; tpd captest" + STATE, f"\n{PASS}true\n1\n0\n", RESET),
    ("", "tpd log_enable; tpd log_enable" + UP + "; tpd THP_GetStatus | head -n 1",
     "\n\nthplog: true\n", "persist.thplog_enabled=true " + RESET),
    ("setprop persist.odm.thp.thplog_enabled true", "tpd log_disable; getprop odm.thp.ver_dae",
     "\ntrue\n", "persist.sys.zelmor.debug.on=false persist.ver_dae=true ver_dae=true "
     "persist.thplog_enabled=false " + RESET),
    ("", "tpd log_afe_enable" + UP + "; getprop odm.thp.debug.afelog", "\ntrue\n",
     "debug.afelog=true " + RESET),
    ("", "tpd debugRawEnable; tpd debugDifEnable; getprop thp.debug.raw", "\n\nfalse\n",
     "thp.debug.raw=true thp.debug.raw=false"),
    ("tpd showtouch", "for i in show_touches pointer_location; do settings get system $i; done; "
     "tpd showtouch_close; settings get system pointer_location", "1\n1\n\n0\n", ""),
    ("tpd stop" + OFF, "tpd THP_GetStatus", DOWN, "CheckAlive*11", 2),
    ("setprop sim.updating_fw true; until getprop odm.thp.is_updating_fw | grep true; do :; done",
     "tpd captest; setprop sim.updating_fw false" + UP + STATE, BYPASS + "true\n1\n0\n", ""),
    ("tpd stop" + OFF + "; setprop odm.thp.dae_alive true; setprop odm.thp.binder 1",
     "tpd captest; sleep .3; tpd captest", NO_SERVICE + PASS, "failed*2 service_enable=1", .4),
    ("setprop sim.fault_count 1; setprop sim.fault die_before", "tpd captest" + STATE,
     PASS + "true\n1\n1\n", "retry ="),
    ("setprop sim.fault die_during", "tpd captest; grep -c 'binder died' log", TIMEOUT + "2\n",
     "retry =*2 " + RESET),
    ("setprop sim.fault_count 1; setprop sim.fault captest_restart", "tpd captest running_test"
     + AGAIN + "; tpd captest" + STATE, "captest running_test: PASS\n" + PASS + "true\n1\n1\n", ""),
    ("kill -KILL $(cat init.pid); touch tmp/1.2; sleep .1; device start; setprop "
     "odm.thp.debug.selinux.permissive 1", "device start 2>/dev/null; tpd captest", PASS, ""),
    ("", "setprop ro.build.display.id 2; setprop a..b 2; setprop a.b $(printf %92s | tr ' ' x); "
     "settings put system ../x 1; getprop ro.build.display.id; getprop a.b; settings get system x",
     "VIRTUAL-11.0\n\nnull\n", ""),
)

if __name__ == "__main__":
    campaign([(REAL, *road) for road in ROADS])
