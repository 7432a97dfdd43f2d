# peers.csv holds: number of the item, item, group, how many times as long as ours.
load plots."/style.gp"
stats "peers.csv" using 1 nooutput
set terminal svg size 860,(90 + 19 * (STATS_max + 1))
set xlabel "time of the peer / our time (right of 1: ours is faster)"
set logscale x
set offsets 0, 0, 0, 0
set yrange [STATS_max + 0.6:-0.6]
set arrow from 1, graph 0 to 1, graph 1 nohead linecolor rgb "#1f5fa8" linewidth 1.5
groups = "SQLiteCpp SOCI inih GLib Boost jsoncpp others"
plot for [group = 1:words(groups)] "peers.csv" \
    using (strcol(3) eq word(groups, group) ? $4 : NaN):1:yticlabel(2) \
    with points linetype 3 + group pointsize 0.9 title word(groups, group)
