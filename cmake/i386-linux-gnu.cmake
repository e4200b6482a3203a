# 32-bit x86, the ABI the handsets run, built on an x86-64 Debian host with
# the multilib compiler and the i386 multiarch libraries
# (scripts/install-deps.sh --i386 installs both).
#
#   cmake -S . -B build-i386 -DCMAKE_TOOLCHAIN_FILE=cmake/i386-linux-gnu.cmake
#
# Whether the host kernel runs the result natively or through qemu-i386 is
# decided when the build is configured (cmake/Run32.cmake).
set(CMAKE_C_COMPILER gcc)
set(CMAKE_CXX_COMPILER g++)
set(CMAKE_C_FLAGS_INIT -m32)
set(CMAKE_CXX_FLAGS_INIT -m32)
# libbacktrace (under libutils) needs the i386 7z.so, unpacked apart from the
# amd64 one that owns its usual place: the linker is told where it is, and
# so is every 32-bit program at run time (cmake/Run32.cmake).
set(QUELLBORN_I386_PRIVATE_LIBS /opt/quellborn-i386/p7zip/usr/lib/p7zip CACHE PATH "i386 libraries kept out of the system's library paths")
set(CMAKE_EXE_LINKER_FLAGS_INIT "-m32 -Wl,-rpath-link,${QUELLBORN_I386_PRIVATE_LIBS}")
set(CMAKE_SHARED_LINKER_FLAGS_INIT "-m32 -Wl,-rpath-link,${QUELLBORN_I386_PRIVATE_LIBS}")
set(CMAKE_MODULE_LINKER_FLAGS_INIT "-m32 -Wl,-rpath-link,${QUELLBORN_I386_PRIVATE_LIBS}")
set(CMAKE_LIBRARY_ARCHITECTURE i386-linux-gnu)
set(CMAKE_LIBRARY_PATH /usr/lib/i386-linux-gnu)

# The 32-bit JVM: an installed i386 JDK, else the one scripts/install-deps.sh
# unpacks. Without either the JVM-hosting tests are skipped, saying so.
set(jdk32 /usr/lib/jvm/java-17-openjdk-i386)
if(NOT EXISTS ${jdk32}/lib/server/libjvm.so)
  set(jdk32 /opt/quellborn-i386/jdk/usr/lib/jvm/java-17-openjdk-i386)
endif()
set(QUELLBORN_JDK_HOME ${jdk32} CACHE PATH "JDK whose javac and libjvm the host build uses")
