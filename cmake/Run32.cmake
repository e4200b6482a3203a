# How this host runs what a 32-bit build makes, decided once at configure
# time: natively where the kernel executes i386 programs, through qemu-i386
# where it cannot (kernels built without 32-bit support). Handsets run the
# same programs natively; the emulator is only this host's way in.
#
# Sets CMAKE_CROSSCOMPILING_EMULATOR (CTest, gtest discovery and add_test
# go through it) and QUELLBORN_EXEC, the same prefix as one shell word list
# for the tests whose scripts run the tools.

set(probe_dir ${CMAKE_BINARY_DIR}/run32-probe)
file(WRITE ${probe_dir}/probe.c "int main(void) { return sizeof(void *) == 4 ? 0 : 1; }\n")
try_run(run32_status run32_built ${probe_dir} ${probe_dir}/probe.c
        COPY_FILE ${probe_dir}/probe RUN_OUTPUT_VARIABLE run32_output)
if(NOT run32_built)
  message(FATAL_ERROR "cannot build a 32-bit program: is g++-multilib installed (scripts/install-deps.sh --i386)?")
endif()

# Libraries the i386 packages need but cannot install beside their amd64
# twins (libbacktrace's 7z.so): found through LD_LIBRARY_PATH, since the
# library that needs it carries its own search path.
set(run32_env LD_LIBRARY_PATH=${QUELLBORN_I386_PRIVATE_LIBS})
if(run32_status STREQUAL "0")
  set(CMAKE_CROSSCOMPILING_EMULATOR env ${run32_env})
  message(STATUS "32-bit programs run natively on this kernel")
else()
  find_program(QEMU_I386 qemu-i386)
  if(NOT QEMU_I386)
    message(FATAL_ERROR "this kernel cannot execute 32-bit programs and qemu-i386 is missing (scripts/install-deps.sh --i386 installs qemu-user)")
  endif()
  execute_process(COMMAND ${QEMU_I386} ${probe_dir}/probe RESULT_VARIABLE qemu_status)
  if(NOT qemu_status STREQUAL "0")
    message(FATAL_ERROR "qemu-i386 cannot run a 32-bit program here (status ${qemu_status})")
  endif()
  # qemu-i386 7.2 hands a signalled thread another thread's TLS on sigreturn
  # (platform/emulator/signal-tls-probe.c); where it does, every program it
  # runs preloads the repair, which the build makes first.
  try_compile(tls_probe_built ${probe_dir}/tls ${CMAKE_SOURCE_DIR}/platform/emulator/signal-tls-probe.c
              LINK_LIBRARIES pthread COPY_FILE ${probe_dir}/signal-tls-probe)
  execute_process(COMMAND ${QEMU_I386} ${probe_dir}/signal-tls-probe RESULT_VARIABLE tls_status OUTPUT_QUIET)
  if(NOT tls_status STREQUAL "0")
    set(QUELLBORN_EMULATOR_REPAIR ${CMAKE_BINARY_DIR}/libqemu-i386-signal-tls.so)
    add_library(qemu-i386-signal-tls MODULE ${CMAKE_SOURCE_DIR}/platform/emulator/qemu-i386-signal-tls.c)
    set_target_properties(qemu-i386-signal-tls PROPERTIES PREFIX lib LIBRARY_OUTPUT_DIRECTORY ${CMAKE_BINARY_DIR})
    target_link_libraries(qemu-i386-signal-tls PRIVATE ${CMAKE_DL_LIBS} Threads::Threads)
    list(APPEND run32_env -E LD_PRELOAD=${QUELLBORN_EMULATOR_REPAIR})
    message(STATUS "qemu-i386 replaces a signalled thread's TLS here: its programs preload ${QUELLBORN_EMULATOR_REPAIR}")
  endif()
  set(CMAKE_CROSSCOMPILING_EMULATOR ${QEMU_I386} -E ${run32_env})
  message(STATUS "32-bit programs run through ${QEMU_I386}: this kernel cannot execute them (handsets run them natively)")
endif()
list(JOIN CMAKE_CROSSCOMPILING_EMULATOR " " QUELLBORN_EXEC)
set(QUELLBORN_EXEC "${QUELLBORN_EXEC} ")
