# Requests a second against callers, every way to serve a line. Needs `folder`,
# where service.csv lies.
set terminal pngcairo size 800,500 font "sans,10"
set output folder."/callers.png"
set datafile separator "\t"
set key autotitle columnhead outside right
set logscale xy
set xtics (1, 2, 4, 8)
set xrange [0.9:9]
set xlabel "callers"
set ylabel "requests a second"
set grid
set title "Verification through the web server"
stats folder."/service.csv" skip 1 nooutput
plot for [way=2:STATS_columns] folder."/service.csv" using 1:way with linespoints lw 2
