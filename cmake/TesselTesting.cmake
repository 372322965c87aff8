# tessel_add_test(<name>
#                 SOURCES <file>...
#                 [LIBS <target>...]        what the program links besides GoogleTest
#                 [PG]                      the sandbox starts a private PostgreSQL server
#                 [TIMEOUT <seconds>]
#                 [LABELS <label>...])
#
# Builds a GoogleTest program and registers it with CTest.
#
# tessel_add_sandboxed_test(<name> COMMAND <command> [<arg>...] [PG] [TIMEOUT <seconds>])
#
# Registers any other command as a test.
#
# Every test runs in its own sandbox (tests/sandbox/tessel-sandbox): a private
# mount namespace in which the library's fixed system paths are fresh tmpfs
# directories, passwd/group/shadow are the test copies, /dev/log is captured
# and, with PG, a private PostgreSQL server answers on the default socket.
find_package(GTest REQUIRED)

set(TESSEL_SANDBOX ${PROJECT_SOURCE_DIR}/tests/sandbox/tessel-sandbox)

function(tessel_add_sandboxed_test name)
  cmake_parse_arguments(T "PG" "TIMEOUT" "COMMAND;LABELS" ${ARGN})
  set(sandbox_args --state ${PROJECT_BINARY_DIR}/sandbox --name ${name}
                   --syslogd $<TARGET_FILE:tessel-syslogd>)
  if(T_PG)
    list(APPEND sandbox_args --pg)
  endif()
  add_test(NAME ${name} COMMAND ${TESSEL_SANDBOX} ${sandbox_args} -- ${T_COMMAND})
  if(NOT T_TIMEOUT)
    set(T_TIMEOUT 600)
  endif()
  set_tests_properties(${name} PROPERTIES TIMEOUT ${T_TIMEOUT})
  if(T_LABELS)
    set_tests_properties(${name} PROPERTIES LABELS "${T_LABELS}")
  endif()
endfunction()

function(tessel_add_test name)
  cmake_parse_arguments(T "PG" "TIMEOUT" "SOURCES;LIBS;LABELS" ${ARGN})
  add_executable(${name} ${T_SOURCES})
  target_link_libraries(${name} PRIVATE ${T_LIBS} GTest::gtest GTest::gtest_main Threads::Threads)
  if(TARGET tessel_test_support)
    target_link_libraries(${name} PRIVATE tessel_test_support)
  endif()
  set(pass_on)
  if(T_PG)
    list(APPEND pass_on PG)
  endif()
  if(T_TIMEOUT)
    list(APPEND pass_on TIMEOUT ${T_TIMEOUT})
  endif()
  if(T_LABELS)
    list(APPEND pass_on LABELS ${T_LABELS})
  endif()
  tessel_add_sandboxed_test(${name} COMMAND $<TARGET_FILE:${name}> ${pass_on})
endfunction()
