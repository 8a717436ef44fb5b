# Warnings and hardening for every target of the project. Warnings are errors in the presets alone: elsewhere the compiler
# may be one that warns of something new.
set(warnings_as_errors)
if(ORVEL_WERROR)
  set(warnings_as_errors -Werror)
endif()
add_compile_options(
  -Wall -Wextra ${warnings_as_errors} -Wshadow -Wformat=2 -Wundef -Wvla -Wcast-align -Wpointer-arith
  $<$<COMPILE_LANGUAGE:CXX>:-Wnon-virtual-dtor> $<$<COMPILE_LANGUAGE:CXX>:-Woverloaded-virtual>
  -fstack-protector-strong -fno-plt -fno-semantic-interposition)
add_link_options(-Wl,-z,relro -Wl,-z,now -Wl,-z,noexecstack -Wl,--as-needed)

if(CMAKE_SYSTEM_PROCESSOR STREQUAL "x86_64")
  add_compile_options(-fcf-protection)
endif()

if(ORVEL_SANITIZE)
  add_compile_options(-fsanitize=${ORVEL_SANITIZE} -fno-sanitize-recover=all -fno-omit-frame-pointer)
  add_link_options(-fsanitize=${ORVEL_SANITIZE})
else()
  # _FORTIFY_SOURCE needs an optimising build; the sanitizers replace its checks.
  add_compile_options($<$<NOT:$<CONFIG:Debug>>:-U_FORTIFY_SOURCE> $<$<NOT:$<CONFIG:Debug>>:-D_FORTIFY_SOURCE=2>)
  add_compile_definitions(_GLIBCXX_ASSERTIONS)
  add_link_options(-Wl,-z,defs)
endif()
