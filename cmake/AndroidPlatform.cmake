# Debian's Android platform libraries live outside the default search paths.
set(ANDROID_LIB_DIR /usr/lib/${CMAKE_LIBRARY_ARCHITECTURE}/android)
set(ANDROID_INCLUDE_DIR /usr/include/android)

foreach(lib log base cutils)
    find_library(ANDROID_${lib}_LIBRARY NAMES ${lib} PATHS ${ANDROID_LIB_DIR} NO_DEFAULT_PATH
                 REQUIRED)
    add_library(android::${lib} SHARED IMPORTED)
    set_target_properties(android::${lib} PROPERTIES
        IMPORTED_LOCATION ${ANDROID_${lib}_LIBRARY}
        INTERFACE_INCLUDE_DIRECTORIES ${ANDROID_INCLUDE_DIR})
endforeach()
set_property(TARGET android::base APPEND PROPERTY INTERFACE_LINK_LIBRARIES android::log)
list(APPEND CMAKE_BUILD_RPATH ${ANDROID_LIB_DIR})
list(APPEND CMAKE_INSTALL_RPATH ${ANDROID_LIB_DIR})

# libbase's header-only parts (thread annotations) for code that links no libbase.
add_library(android::base_headers INTERFACE IMPORTED)
set_target_properties(android::base_headers PROPERTIES
    INTERFACE_INCLUDE_DIRECTORIES ${ANDROID_INCLUDE_DIR})
