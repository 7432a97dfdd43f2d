#!/bin/sh
# Nothing of the library runs when a program loads it: no object may bring a global constructor
# along, and none may include <iostream>, whose streams are set up by one.
#
#     load_time_test.sh OBJECT_OR_ARCHIVE...
#
# Names every object that does, and fails. Meant for objects without instrumentation: sanitizers
# and coverage add constructors of their own.
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
