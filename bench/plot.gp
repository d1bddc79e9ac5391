# Plots cost against rows, from lines of "operation <tab> rows <tab> library <tab> floor".
#
#   gnuplot -e "data='FILE'; out='FILE.svg'" plot.gp

set terminal svg size 860,520 dynamic font 'sans-serif,13' background 'white'
set output out
set datafile separator '\t'
set title 'Instructions of one operation (solid: library, dashed: floor)'
set xlabel 'rows in the table'
set logscale y
set format y '10^{%L}'
set grid ytics
set key outside right reverse Left
set linetype 5 linecolor 'black'
names = system(sprintf("cut -f 1 '%s' | uniq | tr ' ' '_' | tr '\n' ' '", data))
spelt(name) = system(sprintf("printf %s '%s' | tr _ ' '", '%s', name))
is(name) = sprintf("< awk -F '\t' '$1 == \"%s\"' '%s'", spelt(name), data)
plot for [i = 1:words(names)] is(word(names, i)) using 2:3 with linespoints \
       linecolor i linewidth 2 pointtype 7 pointsize 0.4 title spelt(word(names, i)), \
     for [i = 1:words(names)] is(word(names, i)) using 2:4 with lines \
       linecolor i linewidth 1.5 dashtype 2 notitle
