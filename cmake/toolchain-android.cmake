# A handset: the compiler and sysroot of the NDK that ANDROID_NDK names, in the environment or as a variable.
if(NOT ANDROID_NDK)
  set(ANDROID_NDK "$ENV{ANDROID_NDK}")
endif()
set(VX_NDK_TOOLCHAIN "${ANDROID_NDK}/build/cmake/android.toolchain.cmake")
if(NOT EXISTS "${VX_NDK_TOOLCHAIN}")
  message(FATAL_ERROR "ANDROID_NDK has to name an Android NDK: there is no ${VX_NDK_TOOLCHAIN}")
endif()

# A try_compile starts over with this file and has to find the NDK again.
set(ENV{ANDROID_NDK} "${ANDROID_NDK}")

# What a 32-bit handset needs, unless told otherwise.
if(NOT ANDROID_ABI)
  set(ANDROID_ABI armeabi-v7a)
endif()
if(NOT ANDROID_PLATFORM)
  set(ANDROID_PLATFORM 21)
endif()
# The daemon uses no C++ runtime that would have to be installed beside it.
set(ANDROID_STL c++_static)

include("${VX_NDK_TOOLCHAIN}")
