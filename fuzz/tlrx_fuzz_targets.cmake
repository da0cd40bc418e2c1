# Every fuzz/fuzz_<name>.cpp is one target: a libFuzzer program (fuzz builds
# only) and a replay program with a plain main that runs the inputs of
# fuzz/corpus/<name>/ (and any files or folders given), so that a crash kept
# there becomes a regression test. Included by fuzz/ and by tests/. Targets
# link the GeoTIFF library and the ones it uses.
set(TLRX_FUZZ_DIR ${CMAKE_CURRENT_LIST_DIR})
file(GLOB TLRX_FUZZ_SOURCES CONFIGURE_DEPENDS ${TLRX_FUZZ_DIR}/fuzz_*.cpp)

# theWithFuzzer: also build the libFuzzer program. theTestPrefix: ctest name
# prefix of the corpus replays ("" for none).
function(tlrx_add_fuzz_targets theWithFuzzer theTestPrefix)
  set(aNames "")
  foreach(aSource ${TLRX_FUZZ_SOURCES})
    get_filename_component(aName ${aSource} NAME_WE)
    list(APPEND aNames ${aName})
    add_executable(${aName}_replay ${aSource} ${TLRX_FUZZ_DIR}/tlrx_fuzz_support.cpp
                   ${TLRX_FUZZ_DIR}/tlrx_fuzz_replay_main.cpp)
    target_include_directories(${aName}_replay PRIVATE ${TLRX_FUZZ_DIR})
    target_link_libraries(${aName}_replay PRIVATE tlrx_geotiff)
    if(theWithFuzzer)
      add_executable(${aName} ${aSource} ${TLRX_FUZZ_DIR}/tlrx_fuzz_support.cpp)
      target_include_directories(${aName} PRIVATE ${TLRX_FUZZ_DIR})
      target_link_libraries(${aName} PRIVATE tlrx_geotiff)
      target_link_options(${aName} PRIVATE -fsanitize=fuzzer)
    endif()
    if(theTestPrefix AND EXISTS ${TLRX_FUZZ_DIR}/corpus/${aName})
      string(REGEX REPLACE "^fuzz_" "" aShort ${aName})
      add_test(NAME ${theTestPrefix}${aShort}.corpus COMMAND ${aName}_replay ${TLRX_FUZZ_DIR}/corpus/${aName})
    endif()
  endforeach()
  set(TLRX_FUZZ_NAMES ${aNames} PARENT_SCOPE)
endfunction()
