# What `cmake --install` lays out, and the files that tell a host where it went. The libraries and
# the tool find each other relative to themselves, so any prefix works without environment
# variables:
#
#   bin/tessarofx                            RUNPATH $ORIGIN/<bin to libdir>
#   <libdir>/libTessaroFx.so.0               the plug-in; RUNPATH $ORIGIN finds the host kit
#   <libdir>/libTessaroFxHost.so.0           the host kit
#   <libdir>/tessarofx/kernels/              OpenCL programs, beside the plug-in as the tool expects
#   <includedir>/tessarofx/                  TessaroFx.h, HostKit.h, ImageFunctions.h and parts
#   <libdir>/cmake/TessaroFx/                find_package(TessaroFx CONFIG)
#   <libdir>/pkgconfig/tessarofx.pc          host kit; tessarofx-image.pc: the image functions
#   lib/python3/dist-packages/tessarofx/     the Python package; RUNPATH $ORIGIN/<it to libdir>
include(CMakePackageConfigHelpers)

set_target_properties(TessaroFx TessaroFxHost PROPERTIES
  VERSION ${PROJECT_VERSION} SOVERSION ${PROJECT_VERSION_MAJOR})
# A host that does not link the host kit (a frei0r or OFX bridge inside a video tool) still
# loads the plug-in: the loader finds the kit beside it.
set_target_properties(TessaroFx PROPERTIES INSTALL_RPATH "$ORIGIN")
file(RELATIVE_PATH TFX_BIN_TO_LIB ${CMAKE_INSTALL_FULL_BINDIR} ${CMAKE_INSTALL_FULL_LIBDIR})
# The same entry finds the linked image functions and serves the tool's dlopen of the plug-in
# by its SONAME.
set_target_properties(tessarofx PROPERTIES INSTALL_RPATH "$ORIGIN/${TFX_BIN_TO_LIB}")

install(TARGETS TessaroFx TessaroFxHost tessarofx)
install(DIRECTORY include/tessarofx DESTINATION ${CMAKE_INSTALL_INCLUDEDIR})
install(FILES ${TFX_KERNELS} DESTINATION ${CMAKE_INSTALL_LIBDIR}/${TFX_KERNEL_SUBDIR})

# CMake package: paths are relative to the package's own location, so the installed tree can be
# moved as a whole. The library file names come from the targets.
set(TFX_CMAKE_DIR ${CMAKE_INSTALL_LIBDIR}/cmake/TessaroFx)
set(TFX_KERNEL_INSTALL_DIR ${CMAKE_INSTALL_LIBDIR}/${TFX_KERNEL_SUBDIR})
configure_package_config_file(cmake/TessaroFxConfig.cmake.in
  ${CMAKE_CURRENT_BINARY_DIR}/package/TessaroFxConfig.cmake.in
  INSTALL_DESTINATION ${TFX_CMAKE_DIR}
  PATH_VARS CMAKE_INSTALL_INCLUDEDIR CMAKE_INSTALL_LIBDIR TFX_KERNEL_INSTALL_DIR)
file(GENERATE OUTPUT ${CMAKE_CURRENT_BINARY_DIR}/package/TessaroFxConfig.cmake
  INPUT ${CMAKE_CURRENT_BINARY_DIR}/package/TessaroFxConfig.cmake.in)
write_basic_package_version_file(${CMAKE_CURRENT_BINARY_DIR}/package/TessaroFxConfigVersion.cmake
  COMPATIBILITY SameMajorVersion)
install(FILES ${CMAKE_CURRENT_BINARY_DIR}/package/TessaroFxConfig.cmake
              ${CMAKE_CURRENT_BINARY_DIR}/package/TessaroFxConfigVersion.cmake
        DESTINATION ${TFX_CMAKE_DIR})

# pkg-config files carry absolute paths, and the prefix is only settled when installing starts
# (`cmake --install --prefix`, or /usr when CPack stages the package), so they are written then.
set(TFX_PC_FILES tessarofx tessarofx-image)
set(TFX_PC_SOURCE_DIR ${CMAKE_CURRENT_SOURCE_DIR}/cmake)
set(TFX_PC_BINARY_DIR ${CMAKE_CURRENT_BINARY_DIR}/package)
install(CODE "
  set(TFX_PC_PREFIX \"\${CMAKE_INSTALL_PREFIX}\")
  set(TFX_PC_LIBDIR \"${CMAKE_INSTALL_LIBDIR}\")
  set(TFX_PC_INCLUDEDIR \"${CMAKE_INSTALL_INCLUDEDIR}\")
  set(TFX_PC_KERNEL_SUBDIR \"${TFX_KERNEL_SUBDIR}\")
  set(TFX_PC_PLUGIN \"$<TARGET_SONAME_FILE_NAME:TessaroFx>\")
  set(TFX_PC_VERSION \"${PROJECT_VERSION}\")
  foreach(pc ${TFX_PC_FILES})
    configure_file(\"${TFX_PC_SOURCE_DIR}/\${pc}.pc.in\" \"${TFX_PC_BINARY_DIR}/\${pc}.pc\" @ONLY)
  endforeach()")
list(TRANSFORM TFX_PC_FILES REPLACE "(.+)" "${TFX_PC_BINARY_DIR}/\\1.pc")
install(FILES ${TFX_PC_FILES} DESTINATION ${CMAKE_INSTALL_LIBDIR}/pkgconfig)

# The Python package, where Debian's interpreter looks: <prefix>/lib/python3/dist-packages (with
# prefix /usr, as the .deb installs it, on every Debian python3's path). The module finds the
# plug-in relative to itself, as the tool does.
if(TFX_BUILD_PYTHON)
  set(TFX_INSTALL_PYTHONDIR lib/python3/dist-packages/tessarofx)
  file(RELATIVE_PATH TFX_PYTHON_TO_LIB ${CMAKE_INSTALL_PREFIX}/${TFX_INSTALL_PYTHONDIR}
       ${CMAKE_INSTALL_FULL_LIBDIR})
  set_target_properties(tfx_python PROPERTIES INSTALL_RPATH "$ORIGIN/${TFX_PYTHON_TO_LIB}")
  install(TARGETS tfx_python LIBRARY DESTINATION ${TFX_INSTALL_PYTHONDIR})
  install(FILES ${TFX_PYTHON_SOURCES} DESTINATION ${TFX_INSTALL_PYTHONDIR})
endif()
