# Beyond -Wall and -Wextra: what a reader would take for a fault. Every warning is an error, in every build.
# Left out, each with its reason:
#   -Wsign-conversion       bytes and counts go to and from the C libraries' types
#   -Wuseless-cast          two types may be one on this processor and not on the next
#   -Wmissing-declarations  the plug-in's entry point is declared to nobody but the loader
#   -Wredundant-tags        C's headers have functions of the same name as their structures
#   -Wnull-dereference      guesses, after inlining, about the standard library's insides
add_compile_options(-Wnon-virtual-dtor -Woverloaded-virtual -Wold-style-cast -Wextra-semi -Wcast-qual -Wpointer-arith
                    -Wredundant-decls -Wundef -Wformat=2 -Wzero-as-null-pointer-constant -Wvla -Wdate-time
                    -Wdouble-promotion -Wconversion)
if(CMAKE_CXX_COMPILER_ID STREQUAL "GNU")
  # A constructor's parameter may have the name of the member that it becomes, which only clang tells from a mistake.
  add_compile_options(-Wshadow=local -Wduplicated-cond -Wduplicated-branches -Wlogical-op -Wsuggest-override)
else()
  # Clang counts a library's macros as ours, a fraction that is widened as a conversion, and every sign as one.
  add_compile_options(-Wshadow -Winconsistent-missing-override -Wno-cast-qual -Wno-double-promotion -Wno-sign-conversion)
endif()
