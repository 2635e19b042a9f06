# Draws the processor times that compare.py passes as data blocks. The columns of a block are the
# row's name and, for each program, the lower quartile, the median and the upper quartile.
set encoding utf8
set terminal svg size 960,1100 font "sans-serif,12" background "white"
set multiplot title title noenhanced
set grid ytics
set yrange [0:*]
set ylabel "processor time of one command, µs"
set key top left reverse Left samplen 2
set linetype 1 lc rgb "#b0b0b0"
set linetype 2 lc rgb "#707070"
set linetype 3 lc rgb "#4878a8" pt 7 ps 0.6
set linetype 4 lc rgb "#e08030" pt 7 ps 0.6

set size 1, 0.32
set origin 0, 0.64
set title "Commands (all panels: medians, and quartiles as error bars)"
set style fill solid
set style data histograms
set style histogram errorbars gap 1.5 lw 1.2
set xlabel "command"
plot [][0:*] $commands using 3:2:4:xtic(1) lt 1 title "/bin/true", \
    "" using 6:5:7 lt 2 title "baseline, shared C library", \
    "" using 9:8:10 lt 3 title "baseline", "" using 12:11:13 lt 4 title "tpd"

set size 0.5, 0.31
set style data yerrorlines
set logscale x
set key bottom left
set ytics 500

set title "Forwarded, by size of the reply"
set xlabel "size of the reply"
set xtics ("256 B" 256, "4 KiB" 4096, "64 KiB" 65536, "1 MiB" 1048576)
set xrange [128:2097152]
set origin 0, 0.32
plot $reply using 1:3:2:4 lt 3 title "baseline", "" using 1:6:5:7 lt 4 title "tpd"

set yrange [0:1500<*]
set title "Forwarded, by number of clients, with the cost of xargs"
set xlabel "clients at once"
set xtics (1, 2, 4, 8, 16, 32, 64)
set xrange [0.7:90]
set origin 0.5, 0.32
plot $clients using 1:3:2:4 lt 3 title "baseline", "" using 1:6:5:7 lt 4 title "tpd"

set title "Forwarded, by size of the log"
set xlabel "size of the log"
set xtics ("1 MiB" 1048576, "32 MiB" 33554432, "1 GiB" 1073741824)
set xrange [524288:2147483648]
set origin 0, 0
plot $log using 1:3:2:4 lt 3 title "baseline", "" using 1:6:5:7 lt 4 title "tpd"

set title "Forwarded, by number of properties"
set xlabel "number of properties"
set xtics ("1,000" 1000, "10,000" 10000, "100,000" 100000)
set xrange [500:200000]
set origin 0.5, 0
plot $properties using 1:3:2:4 lt 3 title "baseline", "" using 1:6:5:7 lt 4 title "tpd"
