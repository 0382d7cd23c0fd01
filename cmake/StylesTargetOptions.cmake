# Per-target build settings shared by every target of the project.

# Language level, warnings and sanitizers for one target.
function(styles_target_options target)
  target_compile_features(${target} PUBLIC cxx_std_17)
  set_target_properties(${target} PROPERTIES CXX_EXTENSIONS OFF)
  target_compile_options(${target} PRIVATE -Wall -Wextra -Wpedantic)
  if(STYLES_WARNINGS_AS_ERRORS)
    target_compile_options(${target} PRIVATE -Werror)
  endif()
  if(STYLES_SANITIZE)
    # -O1 keeps sanitized runs of the large-document tests quick; assertions
    # stay on in the Debug configuration the sanitizer build uses.
    target_compile_options(${target} PRIVATE
      -O1 -fsanitize=address,undefined -fno-sanitize-recover=undefined -fno-omit-frame-pointer)
    target_link_options(${target} PRIVATE -fsanitize=address,undefined)
  endif()
  if(STYLES_BUILD_FUZZERS)
    # Coverage for libFuzzer everywhere; only the fuzz targets link its main.
    # Optimised (the Debug configuration adds no -O), assertions on.
    target_compile_options(${target} PRIVATE -O1 -fsanitize=fuzzer-no-link,address,undefined
      -fno-sanitize-recover=undefined -fno-omit-frame-pointer
      -fsanitize-ignorelist=${PROJECT_SOURCE_DIR}/fuzz/sanitizer-ignorelist.txt)
    target_link_options(${target} PRIVATE -fsanitize=address,undefined)
  endif()
endfunction()

# A shared library with hidden symbols, an export macro switched on by
# `building_define`, and the project's version.
function(styles_shared_library target building_define)
  styles_target_options(${target})
  target_compile_definitions(${target} PRIVATE ${building_define})
  set_target_properties(${target} PROPERTIES
    CXX_VISIBILITY_PRESET hidden
    VISIBILITY_INLINES_HIDDEN ON
    VERSION ${PROJECT_VERSION}
    SOVERSION ${PROJECT_VERSION_MAJOR})
endfunction()
