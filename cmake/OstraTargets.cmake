# One place that says how this project's code is compiled; every target goes through one of these helpers.

option(OSTRA_WERROR "Take the compiler's warnings for errors, as ./check does" "$ENV{OSTRA_WERROR}")
option(OSTRA_SYMBOLS "Compile line numbers in, for the files of symbols beside what is shipped" "${WIN32}")
set(OSTRA_SANITIZE "" CACHE STRING "Sanitizers to build with, as in -fsanitize= (empty: none)")
set(CMAKE_CXX_STANDARD 20)
set(CMAKE_CXX_STANDARD_REQUIRED ON)
set(CMAKE_CXX_EXTENSIONS OFF)
set(CMAKE_C_STANDARD 11)
set(CMAKE_POSITION_INDEPENDENT_CODE ON)
set(CMAKE_CXX_VISIBILITY_PRESET hidden)
set(CMAKE_VISIBILITY_INLINES_HIDDEN ON)
find_package(Threads REQUIRED)

# Locations in exception traces begin with \src\ and do not depend on where the tree was checked out. A compiler cache
# that rewrites paths hands the compiler relative ones. (Not a target's option: a list cannot hold texts that end with a
# backslash.)
file(RELATIVE_PATH OSTRA_SOURCE_FROM_BUILD "${PROJECT_BINARY_DIR}" "${PROJECT_SOURCE_DIR}/src")
foreach(OSTRA_SOURCE_ROOT IN ITEMS "${PROJECT_SOURCE_DIR}/src" "${OSTRA_SOURCE_FROM_BUILD}")
  string(APPEND CMAKE_CXX_FLAGS " '-fmacro-prefix-map=${OSTRA_SOURCE_ROOT}/=\\src\\'")
endforeach()

add_library(ostra_options INTERFACE)
target_include_directories(ostra_options INTERFACE "${PROJECT_SOURCE_DIR}/src" "${PROJECT_SOURCE_DIR}/include")
target_compile_options(ostra_options INTERFACE
  -Wall -Wextra -Wpedantic -Wconversion -Wsign-conversion
  # Clang also takes a name for shadowing when it repeats a field of the class that encloses a nested one.
  $<$<C_COMPILER_ID:GNU>:-Wshadow>
  -Wcast-align -Wformat=2
  # The warnings of a compiler that nobody has tried must not keep anybody from building.
  $<$<BOOL:${OSTRA_WERROR}>:-Werror>
  $<$<COMPILE_LANGUAGE:CXX>:-Wnon-virtual-dtor -Woverloaded-virtual -Wold-style-cast -Wextra-semi>
  # When it optimises, GCC 12 sees overlaps and overruns in what std::string and std::vector do inside themselves.
  $<$<AND:$<CXX_COMPILER_ID:GNU>,$<NOT:$<CONFIG:Debug>>>:-Wno-restrict>
  $<$<AND:$<CXX_COMPILER_ID:GNU>,$<NOT:$<CONFIG:Debug>>>:-Wno-array-bounds>
  $<$<AND:$<CXX_COMPILER_ID:GNU>,$<NOT:$<CONFIG:Debug>>>:-Wno-stringop-overflow>
  $<$<AND:$<CXX_COMPILER_ID:GNU>,$<NOT:$<CONFIG:Debug>>>:-Wno-maybe-uninitialized>
  $<$<AND:$<CXX_COMPILER_ID:GNU>,$<NOT:$<CONFIG:Debug>>>:-Wno-stringop-overread>
  -ffunction-sections -fdata-sections
  "-fdebug-prefix-map=${PROJECT_SOURCE_DIR}/=")
target_link_libraries(ostra_options INTERFACE Threads::Threads)
if(WIN32)
  # A program is one file: the compiler's run-time libraries are part of it. Nothing newer than Windows XP is used.
  target_compile_definitions(ostra_options INTERFACE _WIN32_WINNT=0x0501 WIN32_LEAN_AND_MEAN NOMINMAX)
  target_link_options(ostra_options INTERFACE -static -Wl,--gc-sections)
endif()
if(OSTRA_SANITIZE)
  # Tests had better compile fast: it is the rest that is watched for undefined behaviour.
  target_compile_options(ostra_options INTERFACE -fsanitize=${OSTRA_SANITIZE} -fno-omit-frame-pointer -fno-sanitize-recover=all
    $<$<BOOL:$<TARGET_PROPERTY:OSTRA_IS_TEST>>:-fno-sanitize=undefined>)
  target_link_options(ostra_options INTERFACE -fsanitize=${OSTRA_SANITIZE})
endif()

# ostra_library(NAME SOURCES ... [LINK ...]): a static library of this project.
function(ostra_library NAME)
  cmake_parse_arguments(ARG "" "" "SOURCES;LINK" ${ARGN})
  add_library(${NAME} STATIC ${ARG_SOURCES})
  target_compile_options(${NAME} PRIVATE $<$<BOOL:${OSTRA_SYMBOLS}>:-g1>)
  target_link_libraries(${NAME} PUBLIC ostra_options ${ARG_LINK})
endfunction()

# ostra_program(NAME SOURCES ... [LINK ...]): an executable of this project.
function(ostra_program NAME)
  cmake_parse_arguments(ARG "" "" "SOURCES;LINK" ${ARGN})
  add_executable(${NAME} ${ARG_SOURCES})
  target_link_libraries(${NAME} PRIVATE ${ARG_LINK} ostra_options)
endfunction()

# ostra_shipped(TARGET FILE DESCRIPTION): what users get. On Windows, where it is called FILE, it says in its properties what it
# is and of which version, keeps its symbols in FILE.debug beside it, and has the same bytes whenever it is built.
function(ostra_shipped TARGET FILE DESCRIPTION)
  target_compile_options(${TARGET} PRIVATE $<$<BOOL:${OSTRA_SYMBOLS}>:-g1>)
  if(NOT WIN32)
    return()
  endif()
  string(REPLACE "." "," VERSION_NUMBERS "${PROJECT_VERSION}")
  set(FILE_TYPE VFT_APP)
  if(FILE MATCHES "\\.dll$")
    set(FILE_TYPE VFT_DLL)
  endif()
  set(RESOURCE "${CMAKE_CURRENT_BINARY_DIR}/${FILE}.rc")
  configure_file("${PROJECT_SOURCE_DIR}/packaging/version.rc.in" "${RESOURCE}" @ONLY)
  # Apart from the target, whose options are not for the resource compiler.
  add_library(${TARGET}_version OBJECT "${RESOURCE}")
  target_sources(${TARGET} PRIVATE $<TARGET_OBJECTS:${TARGET}_version>)
  target_link_options(${TARGET} PRIVATE LINKER:--no-insert-timestamp)
  set(OBJCOPY "${CMAKE_COMMAND}" -E env SOURCE_DATE_EPOCH=0 "${CMAKE_OBJCOPY}")
  add_custom_command(TARGET ${TARGET} POST_BUILD
    COMMAND ${OBJCOPY} --only-keep-debug $<TARGET_FILE:${TARGET}> ${FILE}.debug
    COMMAND ${OBJCOPY} --strip-all --add-gnu-debuglink=${FILE}.debug $<TARGET_FILE:${TARGET}>
    BYPRODUCTS ${FILE}.debug VERBATIM)
endfunction()

# ostra_test(NAME SOURCES ... [LINK ...] [EXACT_TIME ...] [WAITS_LONG] [ONE_THREAD] [OWN_NAMES]): a GoogleTest program,
# run by ctest as one test under its name. What has ONE_THREAD only is nothing for ThreadSanitizer. A program with OWN_NAMES
# gives its instruments names that no other's have, and so need not wait for others. Where there is no virtual time, on Windows, the cases are left out that EXACT_TIME names (as in --gtest_filter), because their outcome hangs on
# milliseconds or they take minutes, and a program that WAITS_LONG runs as several tests side by side, each with its share
# of the cases.
function(ostra_test NAME)
  cmake_parse_arguments(ARG "WAITS_LONG;ONE_THREAD;OWN_NAMES" "" "SOURCES;LINK;EXACT_TIME" ${ARGN})
  ostra_program(${NAME} SOURCES ${ARG_SOURCES} LINK ${ARG_LINK} ostra_gtest $<$<TARGET_EXISTS:ostra_virtual_time>:ostra_virtual_time>)
  target_include_directories(${NAME} PRIVATE "${PROJECT_SOURCE_DIR}/tests" "${PROJECT_SOURCE_DIR}/simulator")
  set_target_properties(${NAME} PROPERTIES OSTRA_IS_TEST ON)
  target_compile_options(${NAME} PRIVATE -O0)  # as compiling it takes longer than running it
  if(ARG_ONE_THREAD AND OSTRA_SANITIZE STREQUAL "thread")
    set_target_properties(${NAME} PROPERTIES EXCLUDE_FROM_ALL ON)
    return()
  endif()
  set(COMMAND ${CMAKE_CROSSCOMPILING_EMULATOR} $<TARGET_FILE:${NAME}>)
  if(WIN32)
    # Each test has a Windows of its own, so none waits for another.
    list(JOIN ARG_EXACT_TIME ":" LEFT_OUT)
    set(SHARDS 1)
    if(ARG_WAITS_LONG)
      set(SHARDS 3)
    endif()
    foreach(SHARD RANGE 1 ${SHARDS})
      set(TEST ${NAME})
      if(ARG_WAITS_LONG)
        set(TEST ${NAME}_${SHARD}_of_${SHARDS})
      endif()
      math(EXPR INDEX "${SHARD} - 1")
      add_test(NAME ${TEST} COMMAND ${COMMAND})
      set_tests_properties(${TEST} PROPERTIES TIMEOUT 500 SKIP_RETURN_CODE 77
        ENVIRONMENT "GTEST_FILTER=-${LEFT_OUT};GTEST_TOTAL_SHARDS=${SHARDS};GTEST_SHARD_INDEX=${INDEX}")
    endforeach()
    return()
  endif()
  add_test(NAME ${NAME} COMMAND ${COMMAND})
  set_tests_properties(${NAME} PROPERTIES TIMEOUT 500 SKIP_RETURN_CODE 77)
  # The native transport locks an instrument for the whole machine, by its path: tests of it wait for each other.
  foreach(LIBRARY IN ITEMS ostra_native ostra_browser ostra_interface ostra_service ostra_cli)
    if(LIBRARY IN_LIST ARG_LINK AND NOT ARG_OWN_NAMES)
      set_tests_properties(${NAME} PROPERTIES RESOURCE_LOCK instruments)
    endif()
  endforeach()
endfunction()

# ostra_fuzz(NAME SOURCES ... [LINK ...]): a libFuzzer target; its inputs to begin with are in fuzz/corpus/NAME.
function(ostra_fuzz NAME)
  ostra_program(${NAME} ${ARGN})
  target_link_options(${NAME} PRIVATE -fsanitize=fuzzer)
endfunction()
