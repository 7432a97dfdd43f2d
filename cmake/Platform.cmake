# Defines OrvaPlatform::core and OrvaPlatform::random: the appliance's platform libraries, or our
# stand-ins.
if(ORVADR_PLATFORM STREQUAL "bundled")
    add_subdirectory(platform)
elseif(ORVADR_PLATFORM STREQUAL "system")
    foreach(part core random)
        find_path(ORVA_${part}_INCLUDE_DIR orva${part}/orva${part}.h REQUIRED)
        find_library(ORVA_${part}_LIBRARY orva${part} REQUIRED)
        add_library(OrvaPlatform::${part} UNKNOWN IMPORTED)
        set_target_properties(OrvaPlatform::${part} PROPERTIES
            IMPORTED_LOCATION "${ORVA_${part}_LIBRARY}"
            INTERFACE_INCLUDE_DIRECTORIES "${ORVA_${part}_INCLUDE_DIR}")
    endforeach()
else()
    message(FATAL_ERROR "ORVADR_PLATFORM is \"${ORVADR_PLATFORM}\"; it must be bundled or system")
endif()
