# Writes a C++ table of the error codes and their meanings, from the enumerators of errors.h and the
# comment after each.
#
#   orvadr_error_codes(HEADER OUTPUT)
function(orvadr_error_codes header output)
    set_property(DIRECTORY APPEND PROPERTY CMAKE_CONFIGURE_DEPENDS ${header})
    file(STRINGS ${header} lines REGEX "^ +[A-Z_]+ = [0-9]+, +///< ")
    set(entries "")
    foreach(line IN LISTS lines)
        string(REGEX MATCH "= ([0-9]+), +///< (.*)$" matched "${line}")
        string(APPEND entries "    {${CMAKE_MATCH_1}, \"${CMAKE_MATCH_2}\"},\n")
    endforeach()
    file(CONFIGURE OUTPUT ${output} CONTENT "@entries@" @ONLY)
endfunction()
