# The device build (Android.bp) owns the source lists of the libraries that a device links; the
# host build reads them from there, so the two cannot drift.

# Sets out_var to the srcs of `module` in the Android.bp of the current source directory, as
# absolute paths.
function(vyr_android_bp_srcs module out_var)
    set(bp_file ${CMAKE_CURRENT_SOURCE_DIR}/Android.bp)
    set_property(DIRECTORY APPEND PROPERTY CMAKE_CONFIGURE_DEPENDS ${bp_file})
    file(READ ${bp_file} content)
    string(FIND "${content}" "name: \"${module}\"" start)
    if(start EQUAL -1)
        message(FATAL_ERROR "${bp_file}: no module named ${module}")
    endif()
    string(SUBSTRING "${content}" ${start} -1 rest)
    # bpfmt closes every module with a brace at the start of a line.
    string(FIND "${rest}" "\n}" end)
    string(SUBSTRING "${rest}" 0 ${end} body)
    string(REGEX MATCH "srcs: \\[[^]]*\\]" srcs "${body}")
    string(REGEX MATCHALL "\"[^\"]+\"" items "${srcs}")
    if(NOT items)
        message(FATAL_ERROR "${bp_file}: module ${module} has no srcs")
    endif()
    set(result)
    foreach(item IN LISTS items)
        string(REPLACE "\"" "" item "${item}")
        list(APPEND result ${CMAKE_CURRENT_SOURCE_DIR}/${item})
    endforeach()
    set(${out_var} ${result} PARENT_SCOPE)
endfunction()

# Records that host target `target` builds what Android.bp module `module` builds; the list is
# written to device_parity.txt in the build tree, which scripts/check-device compares with
# Android.bp.
function(vyr_device_parity target module)
    set_property(GLOBAL APPEND_STRING PROPERTY VYR_DEVICE_PARITY
        "${module}\t$<JOIN:$<TARGET_PROPERTY:${target},SOURCES>,;>\n")
endfunction()

function(vyr_write_device_parity)
    get_property(content GLOBAL PROPERTY VYR_DEVICE_PARITY)
    file(GENERATE OUTPUT ${CMAKE_BINARY_DIR}/device_parity.txt CONTENT "${content}")
endfunction()
