# How the ratio to bare SQLite changes with the rows of the table: on tmpfs of the
# processor's time, on disk of the time by the clock. Needs `folder`, where
# growth.csv lies.
set terminal pngcairo size 1200,900 font "sans,10"
set output folder."/growth.png"
set datafile separator "\t"
data = folder."/growth.csv"
array names[6] = ["B2 issue a token pair", "B3 verify an access token", \
                  "L1 login whole, kept open", "L2 login whole, opened twice", \
                  "L3 refresh", "L5 purge of half of the rows"]
set logscale x
set xlabel "rows of the table"
set xrange [8:15000]
set yrange [0:*]
set offsets graph 0, 0, graph 0.25, 0
set ylabel "ratio to bare SQLite"
set key top left
set grid
set multiplot layout 2,3
do for [i=1:6] {
  name = names[i]
  set title name
  plot 1 with lines dt 3 lc "black" notitle, \
    data using (strcol(1) eq name && strcol(2) eq "tmpfs" ? column(3) : NaN):(column(7)) \
         with linespoints pt 7 lw 2 title "processor, tmpfs", \
    data using (strcol(1) eq name && strcol(2) eq "disk" ? column(3) : NaN):(column(6)) \
         with linespoints pt 6 lw 2 title "clock, disk"
}
unset multiplot
