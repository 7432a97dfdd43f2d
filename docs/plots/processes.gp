load plots."/style.gp"
set terminal svg size 1080,380
set logscale xy
set xtics (1, 2, 4, 8)
set xrange [0.9:9]
set xlabel "processes that insert into one file"
array Title[3] = ["inserts per second", "99th percentile, ms", "worst wait, ms"]
array Column[3] = [4, 6, 7]
crowd(where, who) = strcol(1) eq where && strcol(2) eq who ? $3 : NaN
unset key
set multiplot layout 1,3 margins 0.05,0.87,0.15,0.91 spacing 0.06,0
do for [panel = 1:3] {
    set title Title[panel]
    if (panel == 3) { set key at screen 0.995,0.9 right top vertical }
    plot for [where in "disk memory"] for [who in "ours bare"] "curves-processes.csv" \
        using (crowd(where, who)):(column(Column[panel])) with linespoints \
        linetype 1 + (who eq "bare") dashtype 1 + (where eq "memory") title who.", ".where
}
unset multiplot
