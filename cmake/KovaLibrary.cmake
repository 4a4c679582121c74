# How a shared object of this project is built: C++20 without exceptions, RTTI or a C++ run-time library.

# Every symbol is there at link time. A change under way may relax it: -DKOVA_LINK_CHECKS=-Wl,-z,undefs,-z,lazy
set(KOVA_LINK_CHECKS "-Wl,-z,defs,-z,now,--no-undefined-version" CACHE STRING "linker checks of the shared objects")

# kova_library(NAME SOURCES... [MAP version-script] [LINK targets...])
function(kova_library name)
  cmake_parse_arguments(arg "" "MAP" "SOURCES;LINK" ${ARGN})
  add_library(${name} SHARED ${arg_SOURCES})
  set_target_properties(${name} PROPERTIES
    VERSION ${PROJECT_VERSION}
    SOVERSION ${PROJECT_VERSION_MAJOR}
    CXX_VISIBILITY_PRESET hidden
    VISIBILITY_INLINES_HIDDEN ON)
  target_compile_options(${name} PRIVATE
    -fno-exceptions -fno-rtti -fno-gnu-unique -fno-threadsafe-statics
    -fstack-protector-strong -Wconversion -Wmissing-declarations)
  target_link_libraries(${name} PRIVATE ${arg_LINK})
  target_link_options(${name} PRIVATE -Wl,--as-needed,-z,relro ${KOVA_LINK_CHECKS})
  if(arg_MAP AND NOT KOVA_COVERAGE)
    target_link_options(${name} PRIVATE -Wl,--version-script=${arg_MAP})
    set_property(TARGET ${name} APPEND PROPERTY LINK_DEPENDS ${arg_MAP})
  endif()
  if(NOT KOVA_SANITIZE)
    # nothing at run time beyond the C library: leaving -lstdc++ out makes a slip a link error
    target_link_options(${name} PRIVATE -nodefaultlibs)
    if(KOVA_COVERAGE)
      target_compile_options(${name} PRIVATE --coverage -fprofile-update=atomic)
      target_link_options(${name} PRIVATE -Wl,-u,__gcov_dump) # exported, so no version script
      target_link_libraries(${name} PRIVATE gcov)
    endif()
    target_link_libraries(${name} PRIVATE c gcc)
  else()
    # the sanitizers' run-time library is linked into the program
    target_link_options(${name} PRIVATE -Wl,-z,undefs)
  endif()
  # a unit reports under its file's name
  foreach(source ${arg_SOURCES})
    get_filename_component(unit ${source} NAME_WE)
    set_property(SOURCE ${source} APPEND PROPERTY COMPILE_DEFINITIONS KOVA_UNIT="${unit}")
  endforeach()
endfunction()
