# Draws docs/performance.svg: every work's cost beside its rival's, and how the cost of an entry grows.
# Run as: gnuplot -e "data='FOLDER'; picture='FILE'" bench/chart.gnuplot, with the files that the report wrote to FOLDER.

set terminal svg noenhanced size 960,1060 font "sans-serif,12" background "#ffffff"
set output picture
set datafile separator tab
set multiplot
set lmargin at screen 0.34
set rmargin at screen 0.97

# Works from top to bottom, each a bar from 1 to the ratio, green where the goal is met; the tick is the goal.
bars = data . "/bars.tsv"
rows = int(system("wc -l < '" . bars . "'"))
set tmargin at screen 0.94
set bmargin at screen 0.40
unset logscale
set title "Cost relative to the rival that each goal names (left of the line: cheaper; tick: the goal)"
set logscale x
set xrange [0.05:5]
set xtics (0.05, 0.1, 0.2, 0.5, 1, 2, 5)
set yrange [rows - 0.4:-0.6]
set grid xtics lc rgb "#dddddd"
unset key
set arrow from 1, graph 0 to 1, graph 1 nohead lc rgb "#222222"
left(x) = x < 1 ? x : 1
right(x) = x < 1 ? 1 : x
plot bars using 2:0:(left($2)):(right($2)):($0 - 0.3):($0 + 0.3):ytic(1) \
       with boxxyerror fill solid noborder lc rgb "#c0392b", \
     '' using (strcol(4) eq "yes" ? $2 : 1/0):0:(left($2)):(right($2)):($0 - 0.3):($0 + 0.3) \
       with boxxyerror fill solid noborder lc rgb "#2e8b57", \
     '' using 3:($0 - 0.4):(0):(0.8) with vectors nohead lw 3 lc rgb "#222222"

unset arrow
set tmargin at screen 0.32
set bmargin at screen 0.05
set title "Cost of one entry as their number grows, relative to that with 10,000 (level: linear)"
unset logscale
set xrange [80:1200000]
set xtics ("100" 100, "1,000" 1000, "10,000" 10000, "100,000" 100000, "1,000,000" 1000000)
set yrange [0.1:30]
set logscale xy
unset ytics
set ytics (0.1, 0.3, 1, 3, 10, 30)
set grid ytics lc rgb "#dddddd"
set key outside left Left reverse
growth = data . "/growth.tsv"
stats growth using 0 nooutput
plot for [i = 0 : STATS_blocks - 2] growth index i using 1:2 with linespoints lw 2 pt 7 ps 0.5 title columnheader(1)
