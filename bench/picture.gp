# Draws the results that the script before this one on gnuplot's command line defines.
set terminal svg size 960,1050 font "sans-serif,13" background "white"
set multiplot layout 3,2 title title margins 0.09,0.98,0.06,0.93 spacing 0.1,0.1
set grid ytics lc rgb "#dddddd"
set style fill solid
set key top left
gray = "#b0b0b0"
blue = "#4878a8"
orange = "#e08030"

set title "One command, microseconds"
set style data histograms
set boxwidth 0.9
set yrange [0:*]
plot $commands using 2:xtic(1) title "/bin/true" lc rgb gray, \
    "" using 3 title "baseline" lc rgb blue, "" using 4 title "tpd" lc rgb orange

set title "Parts: tpd's time, the baseline's being 1"
unset key
set xtics rotate by -20
plot $parts using 2:xtic(1) lc rgb orange, 1 with lines lc rgb blue
set xtics norotate
set key

set style data linespoints
set logscale x
set title "Forwarded, microseconds, by bytes of the reply"
plot $reply using 1:2 title "baseline" lc rgb blue, "" using 1:3 title "tpd" lc rgb orange

set key bottom right
set title "Forwarded commands a second, by clients at once"
plot $once using 1:(1e6 * batch / $2) title "baseline" lc rgb blue, \
    "" using 1:(1e6 * batch / $3) title "tpd" lc rgb orange

set title "Forwarded, microseconds, by bytes in the log"
plot $log using 1:2 title "baseline" lc rgb blue, "" using 1:3 title "tpd" lc rgb orange

set title "Forwarded, microseconds, by number of properties"
plot $Properties using 1:2 title "baseline" lc rgb blue, "" using 1:3 title "tpd" lc rgb orange
