# What makes the faults of software that reads hostile files harder to use. Optimised builds have it: those that are
# shipped. A sanitizer sees more than any of this and gets in its way. tests/hardened_files.py reads the finished files.
#   HARDENED=OFF   for a build to compare with
option(HARDENED "protect stack, control flow and linkage of optimised builds" ON)

if(NOT CMAKE_BUILD_TYPE MATCHES "^(Release|RelWithDebInfo|MinSizeRel)$" OR INSTRUMENTED)
  set(HARDENED OFF)
endif()
if(NOT HARDENED)
  return()
endif()

include(CheckCXXCompilerFlag)
include(CheckPIESupported)
check_pie_supported(LANGUAGES CXX)

set(wanted -fstack-protector-strong -fstack-clash-protection)
if(CMAKE_SYSTEM_PROCESSOR MATCHES "^(x86_64|AMD64|i.86)$")
  list(APPEND wanted -fcf-protection=full)
elseif(CMAKE_SYSTEM_PROCESSOR MATCHES "^(aarch64|arm64)$")
  list(APPEND wanted -mbranch-protection=standard)
endif()
foreach(flag ${wanted})
  string(MAKE_C_IDENTIFIER "takes${flag}" answer)
  check_cxx_compiler_flag(${flag} ${answer})
  if(${answer})
    add_compile_options(${flag})
  endif()
endforeach()

# A compiler that measures no objects whose size is known only while the program runs takes 3 for 2. Some distributions
# define it themselves, to less.
add_compile_options(-U_FORTIFY_SOURCE -D_FORTIFY_SOURCE=3)

# The cheap assertions: an index, an iterator or an optional that is not there ends the process. They change no layout,
# and a host of the plug-in may be compiled without them.
add_compile_options(-D_GLIBCXX_ASSERTIONS)

# Everything is bound when a file is loaded, and what it was bound by cannot be written afterwards.
add_link_options(-Wl,-z,relro -Wl,-z,now -Wl,-z,noexecstack)
