load plots."/style.gp"
set xlabel "values in the IN list"
set ylabel "time for a select from 1,000 rows, ms"
set logscale xy
set format x "10^{%T}"
plot for [who in "ours bare"] "curves.csv" \
    using (at(who, "select by an IN list", 7)):($4 / 1e6) with linespoints title who
