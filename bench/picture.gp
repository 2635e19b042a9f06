# Draws the title and the tables' times that the script before this one defines.
set encoding utf8
set terminal svg size 960,1000 font "sans-serif,12" background "white"
set multiplot layout 3,2 title title noenhanced margins 0.08,0.96,0.05,0.91 spacing 0.1,0.1
set style fill solid
set style data histograms
set grid ytics
set yrange [0:*]
set linetype 1 lc rgb "#b0b0b0"
set linetype 2 lc rgb "#4878a8" pt 7
set linetype 3 lc rgb "#e08030" pt 7
set title "Elapsed µs of one command"
plot $commands using 2:xtic(1) lt 1 title "/bin/true", \
    "" using 6 lt 2 title "baseline", "" using 8 lt 3 title "tpd"
set title "Processor's µs of one command"
plot $commands using 3:xtic(1) lt 1 notitle, "" using 7 lt 2 notitle, "" using 9 lt 3 notitle
unset key
set style data linespoints
set logscale x
set title "Processor's µs, forwarded, by bytes of the reply"
plot $reply_bytes using 1:3 lt 2, "" using 1:5 lt 3
set title "Elapsed ms, 128 forwarded, by clients at once"
plot $clients using 1:($2 / 1000) lt 2, "" using 1:($4 / 1000) lt 3
set title "Processor's µs, forwarded, by bytes in the log"
plot $log_bytes using 1:3 lt 2, "" using 1:5 lt 3
set title "Processor's µs, forwarded, by number of properties"
plot $properties using 1:3 lt 2, "" using 1:5 lt 3
