# Removes what differs from run to run: ids, process ids, temporary files, times, ages and sizes.
s/[0-9a-f]\{8\}-[0-9a-f]\{4\}-[0-9a-f]\{4\}-[0-9a-f]\{4\}-[0-9a-f]\{12\}/<uuid>/g
s/\[[0-9][0-9]*\]:/[<pid>]:/g
s|/tmp/[^] "]*\.db|<db>|g
s/"\(age\|time\|used\|free\)":[0-9][0-9]*/"\1":<\1>/g
