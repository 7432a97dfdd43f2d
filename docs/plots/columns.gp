load plots."/style.gp"
set xlabel "columns of each of 100 rows"
set ylabel "time for a value, ns"
set logscale x
set xtics (1, 5, 20, 200)
set yrange [0:*]
plot for [who in "ours bare"] "curves.csv" \
    using (x = at(who, "select 100 rows of", 5)):($4 / 100 / x) with linespoints title who
