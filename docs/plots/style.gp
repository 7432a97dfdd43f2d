# What all plots share. They run where the CSV files of scripts/bench lie, and `plots` is this folder.
set terminal svg size 760,420 font "Helvetica,13" background "#ffffff" linewidth 1
set datafile separator comma
set datafile missing NaN

set autoscale xfix
set offsets graph 0.02, graph 0.02, 0, 0
set border 3 linecolor rgb "#555555"
set tics nomirror scale 0.5 textcolor rgb "#333333"
set grid linetype 1 linecolor rgb "#e4e4e4"
set key outside top center horizontal textcolor rgb "#333333"
set style fill solid 0.8 noborder

# Ours, bare, contract; then peers.
set linetype 1 linecolor rgb "#1f5fa8" linewidth 2 pointtype 7 pointsize 0.7
set linetype 2 linecolor rgb "#888888" linewidth 2 pointtype 5 pointsize 0.6
set linetype 3 linecolor rgb "#d98c1f" linewidth 2 pointtype 9 pointsize 0.8
set linetype 4 linecolor rgb "#3d8a4d" linewidth 2 pointtype 11 pointsize 0.8
set linetype 5 linecolor rgb "#b0413e" linewidth 2 pointtype 13 pointsize 0.8
set linetype 6 linecolor rgb "#7a5195" linewidth 2 pointtype 4 pointsize 0.7
set linetype 7 linecolor rgb "#3aa6a6" linewidth 2 pointtype 6 pointsize 0.7
set linetype 8 linecolor rgb "#a8782f" linewidth 2 pointtype 8 pointsize 0.7
set linetype 9 linecolor rgb "#c75a9a" linewidth 2 pointtype 10 pointsize 0.7
set linetype 10 linecolor rgb "#5b6b7a" linewidth 2 pointtype 12 pointsize 0.7

# The number of a curve's item, which is one of its words; nothing for other rows of curves.csv.
at(who, prefix, count) = strcol(2) eq who && strstrt(strcol(1), prefix) == 1 \
    ? word(strcol(1), count) + 0 : NaN
