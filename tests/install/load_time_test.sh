#!/bin/sh
# No code of the library may run when a program loads it: no object may have a global constructor or
# include <iostream>, which has one.
#
#     load_time_test.sh OBJECT_OR_ARCHIVE...
#
# Fails and names every object that does. Not for sanitizer and coverage builds, which add constructors.
set -eu

fail() {
    echo "$1"
    failed=1
}

failed=0
[ $# -gt 0 ] || fail "no objects given"
for object; do
    sections=$(readelf --sections --wide "$object")
    symbols=$(nm --demangle "$object")
    case $sections in
        *' .init_array'* | *' .preinit_array'* | *' .ctors'*)
            fail "$object: runs a global constructor" ;;
    esac
    case $symbols in
        *'std::ios_base::Init'*) fail "$object: includes <iostream>" ;;
    esac
done
exit $failed
