load plots."/style.gp"
set xlabel "tables in the file"
set ylabel "time for an insert in a transaction, µs"
set logscale xy
set xtics (1, 10, 100, 1000)
plot for [who in "ours bare contract"] "curves.csv" \
    using (at(who, "insert beside", 3)):($4 / 1e3) with linespoints title who
