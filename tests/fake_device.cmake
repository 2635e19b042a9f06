# The tool on the fake device, for the unit tests and the fuzz target. They call its main() as
# tpd_main(). The linker redirects C library calls to the fake device.
include_guard(GLOBAL)

add_library(tpd_front_end STATIC ${PROJECT_SOURCE_DIR}/main/TpdMain.cpp)
export_headers(tpd_front_end main)
target_compile_definitions(tpd_front_end PRIVATE main=tpd_main)
target_link_libraries(tpd_front_end PUBLIC tpd_daemon PRIVATE tpd_build_options)

# An object library: its definitions of the platform's functions take precedence over those in the
# virtual device's archives.
add_library(fake_device OBJECT ${CMAKE_CURRENT_LIST_DIR}/fake_device.cpp)
export_headers(fake_device tests)
target_link_libraries(
    fake_device
    PUBLIC tpd_front_end tpd_log device_files wrapped_calls
    PRIVATE tpd_build_options)
# The fake device tracks the open streams.
target_link_options(fake_device INTERFACE -Wl,--wrap=fclose)
