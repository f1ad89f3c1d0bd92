# The Debian package: `cmake --build <build> --target package` stages the install rules under /usr
# and writes tessarofx_<version>_<arch>.deb into the build directory. Dependencies come from
# dpkg-shlibdeps (dpkg-dev) reading the installed binaries.
set(CPACK_GENERATOR DEB)
set(CPACK_PACKAGE_NAME tessarofx)
set(CPACK_PACKAGE_VERSION ${PROJECT_VERSION})
set(CPACK_PACKAGE_VENDOR "TessaroFx")
set(CPACK_PACKAGE_DESCRIPTION_SUMMARY "image-filter plug-in for video editors, with host kit and tool")
set(CPACK_PACKAGE_DESCRIPTION
  "TessaroFx is an image-adjustment filter library that a video-editing host loads as a plug-in.
It publishes ten filters (colour, light, white balance, HSL, vignette, lens, 3D LUTs, chroma
key) on 8-bit BGRA frames, each with a CPU class and, for some, an OpenCL class.
.
This package holds the plug-in (libTessaroFx.so.0) with its OpenCL programs, the host kit
(libTessaroFxHost.so.0), the tessarofx command-line tool, the tessarofx Python module for
NumPy arrays, and the headers, CMake package and pkg-config files for writing hosts.")
set(TFX_PACKAGE_MAINTAINER "TessaroFx maintainers <maintainers@tessarofx.example>"
  CACHE STRING "Maintainer field of the Debian package")
set(CPACK_PACKAGE_CONTACT "${TFX_PACKAGE_MAINTAINER}")
set(CPACK_DEBIAN_PACKAGE_MAINTAINER "${TFX_PACKAGE_MAINTAINER}")
set(CPACK_DEBIAN_PACKAGE_SECTION graphics)
set(CPACK_DEBIAN_FILE_NAME DEB-DEFAULT)
set(CPACK_PACKAGING_INSTALL_PREFIX /usr)
set(CPACK_DEBIAN_PACKAGE_SHLIBDEPS ON)
# The OpenCL classes need a driver; without one the CPU classes do all the work.
# The Python module needs the interpreter it was built for and NumPy; the rest of the package
# does not.
if(TFX_BUILD_PYTHON)
  set(CPACK_DEBIAN_PACKAGE_RECOMMENDS
    "python3 (>= ${TFX_PYTHON_VERSION}), python3 (<< ${TFX_PYTHON_NEXT_VERSION}), python3-numpy")
endif()
set(CPACK_DEBIAN_PACKAGE_SUGGESTS "pocl-opencl-icd | opencl-icd, ffmpeg, melt, gstreamer1.0-plugins-bad")
# The plug-in and the tool need the host kit, which this package itself ships: dpkg-shlibdeps
# looks it up among the staged files and the shlibs file generated for them.
set(CPACK_DEBIAN_PACKAGE_GENERATE_SHLIBS ON)
set(CPACK_DEBIAN_PACKAGE_GENERATE_SHLIBS_POLICY ">=")
include(CPack)
