# delvix_add_test(<name> SOURCES <files...> [LIBS <targets...>] [ENV <VAR=value...>] [LAUNCHER <command...>])
# One Qt Test executable per test file, registered with CTest. Widgets run offscreen
# and settings and the user's own data (levels) go to private folders per test, so tests
# never touch the user's files.
function(delvix_add_test name)
    cmake_parse_arguments(ARG "" "" "SOURCES;LIBS;ENV;LAUNCHER" ${ARGN})
    add_executable(${name} ${ARG_SOURCES})
    target_link_libraries(${name} PRIVATE Qt6::Test ${ARG_LIBS})
    add_test(NAME ${name} COMMAND ${ARG_LAUNCHER} $<TARGET_FILE:${name}>)
    set_tests_properties(${name} PROPERTIES
        TIMEOUT 300
        ENVIRONMENT "QT_QPA_PLATFORM=offscreen;XDG_CONFIG_HOME=${CMAKE_BINARY_DIR}/test-config/${name};XDG_DATA_HOME=${CMAKE_BINARY_DIR}/test-data/${name};XDG_RUNTIME_DIR=${CMAKE_BINARY_DIR}/test-runtime/${name};${ARG_ENV}")
    file(MAKE_DIRECTORY ${CMAKE_BINARY_DIR}/test-runtime/${name})
    file(CHMOD ${CMAKE_BINARY_DIR}/test-runtime/${name} DIRECTORY_PERMISSIONS OWNER_READ OWNER_WRITE OWNER_EXECUTE)
endfunction()
