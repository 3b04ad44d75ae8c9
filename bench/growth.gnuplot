# How the cost of an operation grows with the rows of its table: the library
# beside bare SQLite. Needs `folder`, where growth.csv lies.
set terminal pngcairo size 1000,760 font "sans,10"
set output folder."/growth.png"
set datafile separator "\t"
set logscale xy
set xlabel "rows"
set ylabel "microseconds"
set key top left
set grid
set format y "%.0f"
data = folder."/growth.csv"
names = "'B2 issue a token pair' 'B3 verify an access token' 'B4 look up a refresh token' 'B5 purge half of the rows'"
set multiplot layout 2,2
do for [i=1:4] {
  name = word(names, i)
  set title name." (tmpfs)"
  plot data using (strcol(1) eq name && strcol(2) eq "tmpfs" ? column(3) : NaN):(column(4)) \
         with linespoints pt 7 lw 2 title "library", \
       data using (strcol(1) eq name && strcol(2) eq "tmpfs" ? column(3) : NaN):(column(5)) \
         with linespoints pt 6 lw 2 dt 2 title "bare SQLite"
}
unset multiplot
