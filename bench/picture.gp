# Draws the processor times that compare.py passes as the data block $replies. Its columns are the
# size of the reply in bytes, and the lower quartile, the median and the upper quartile of the
# baseline and of tpd.
set encoding utf8
set terminal svg size 720,400 font "sans-serif,12" background "white" noenhanced
set xlabel "size of the daemon's reply, KiB"
set ylabel "processor time of one command, µs"
set xrange [-20:1050]
set yrange [0:*]
set grid ytics
set key top left reverse Left
set style data yerrorlines
set linetype 1 lc rgb "#4878a8" pt 7 ps 0.6
set linetype 2 lc rgb "#e08030" pt 7 ps 0.6
plot $replies using ($1/1024):3:2:4 title "baseline (median, quartiles)", \
    "" using ($1/1024):6:5:7 title "tpd (median, quartiles)"
