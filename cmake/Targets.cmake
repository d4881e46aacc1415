# What every target of the project shares hangs on these INTERFACE targets; nobody edits global flags.

add_library(clipfile_warnings INTERFACE)
target_compile_options(clipfile_warnings INTERFACE
    -Wall -Wextra -Wpedantic -Wconversion -Wshadow $<$<BOOL:${CLIPFILE_WERROR}>:-Werror>
    # The locks are annotated; clang checks what the annotations say. Its -Wconversion takes in changes of sign, which
    # GCC's does not: one meaning of a flag for both.
    "$<$<CXX_COMPILER_ID:Clang>:-Wthread-safety;-Wno-sign-conversion>"
    # GCC 12, when it optimises, sees overlaps in every "text" + std::string (GCC bug 105651).
    "$<$<AND:$<CXX_COMPILER_ID:GNU>,$<VERSION_LESS:$<CXX_COMPILER_VERSION>,13>>:-Wno-restrict>")

add_library(clipfile_sanitizers INTERFACE)
if(CLIPFILE_SANITIZE STREQUAL "address")
    set(_flags -fsanitize=address,undefined -fno-sanitize-recover=all -fno-omit-frame-pointer)
elseif(CLIPFILE_SANITIZE STREQUAL "thread")
    set(_flags -fsanitize=thread -fno-omit-frame-pointer)
elseif(CLIPFILE_SANITIZE STREQUAL "")
    set(_flags)
else()
    message(FATAL_ERROR "CLIPFILE_SANITIZE: '${CLIPFILE_SANITIZE}' is none of address, thread or empty.")
endif()
if(CLIPFILE_FUZZ)
    list(APPEND _flags -fsanitize=fuzzer-no-link)
endif()
target_compile_options(clipfile_sanitizers INTERFACE ${_flags})
if(_flags)
    # GCC sees uninitialised values in what it instruments itself, in std::regex for one, and says so in its manual.
    target_compile_options(clipfile_sanitizers INTERFACE $<$<CXX_COMPILER_ID:GNU>:-Wno-maybe-uninitialized>)
endif()
target_link_options(clipfile_sanitizers INTERFACE ${_flags})

# What is delivered is built so that a mistake that got through cannot be used easily; scripts/check-package looks. Where a
# sanitizer watches, or nothing is optimised, the checks of the library say nothing.
add_library(clipfile_hardening INTERFACE)
if(CMAKE_BUILD_TYPE STREQUAL "Release" AND NOT CLIPFILE_SANITIZE)
    target_compile_options(clipfile_hardening INTERFACE
        -fstack-protector-strong -fstack-clash-protection -fcf-protection -U_FORTIFY_SOURCE -D_FORTIFY_SOURCE=2)
    target_link_options(clipfile_hardening INTERFACE -Wl,-z,relro,-z,now,-z,noexecstack)
endif()

# Log lines carry source paths; they are relative to the tree whatever folder it was built in. A compiler cache makes
# the paths that it is given relative to the build folder, and another clone finds its objects only where no option names
# the tree. A unity build names the tree in the sources that it makes.
add_library(clipfile_paths INTERFACE)
if(CLIPFILE_COMPILER_CACHE)
    file(RELATIVE_PATH _root "${CMAKE_BINARY_DIR}" "${PROJECT_SOURCE_DIR}")
    target_compile_options(clipfile_paths INTERFACE "-fmacro-prefix-map=${_root}=")
endif()
if(CMAKE_UNITY_BUILD OR NOT CLIPFILE_COMPILER_CACHE)
    target_compile_options(clipfile_paths INTERFACE "-fmacro-prefix-map=${PROJECT_SOURCE_DIR}/=")
endif()

# Everything that a target of ours takes over: warnings, sanitizers, hardening, source paths, threads.
add_library(clipfile_common INTERFACE)
target_link_libraries(clipfile_common INTERFACE
    clipfile_warnings clipfile_sanitizers clipfile_hardening clipfile_paths Threads::Threads)
