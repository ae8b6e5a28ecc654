# Debian packages, one per install component (cpack -G DEB in a build
# configured with -DIE_PACKAGING=ON; `./ie package` does both):
#   library   libeditor-svc1       the editor, its effect libraries, its resources
#   dev       libeditor-svc-dev    header, pkg-config file, link-time name
#   platform  editor-svc-platform  the platform services, for hosts outside the platform
#   demo      editor-svc-demo      the demo host with its sample picture
# Install rules land in a component by the directory they are in (see the
# top-level CMakeLists.txt), so new targets and resources follow by
# themselves.
if(NOT IE_PACKAGING)
  return()
endif()

set(IE_PACKAGE_MAINTAINER "editor-svc developers <editor-svc@example.org>" CACHE STRING
    "Maintainer named in the packages")
# A host running on the real platform provides its services under this
# name instead of installing our stand-ins.
set(IE_PLATFORM_VIRTUAL_PACKAGE editor-svc-platform-services)

set(IE_PACKAGE_COMPONENTS library dev platform demo)
set(IE_PACKAGE_NAME_library libeditor-svc1)
set(IE_PACKAGE_NAME_dev libeditor-svc-dev)
set(IE_PACKAGE_NAME_platform editor-svc-platform)
set(IE_PACKAGE_NAME_demo editor-svc-demo)

# Every package carries its copyright and changelog; the demo its manual.
set(IE_PACKAGE_FILES_DIR ${CMAKE_BINARY_DIR}/packaging)
set(IE_PACKAGE_GZIPPED)
foreach(file changelog editor-svc-demo.1)
  add_custom_command(OUTPUT ${IE_PACKAGE_FILES_DIR}/${file}.gz
    COMMAND ${CMAKE_COMMAND} -E copy ${CMAKE_SOURCE_DIR}/packaging/${file} ${IE_PACKAGE_FILES_DIR}/${file}
    COMMAND gzip -9nf ${IE_PACKAGE_FILES_DIR}/${file}
    DEPENDS ${CMAKE_SOURCE_DIR}/packaging/${file}
    VERBATIM)
  list(APPEND IE_PACKAGE_GZIPPED ${IE_PACKAGE_FILES_DIR}/${file}.gz)
endforeach()
add_custom_target(ie-package-files ALL DEPENDS ${IE_PACKAGE_GZIPPED})
set(IE_PACKAGE_FILE_PERMISSIONS OWNER_READ OWNER_WRITE GROUP_READ WORLD_READ)
foreach(component ${IE_PACKAGE_COMPONENTS})
  install(FILES ${CMAKE_SOURCE_DIR}/packaging/copyright ${IE_PACKAGE_FILES_DIR}/changelog.gz
          DESTINATION ${CMAKE_INSTALL_DATAROOTDIR}/doc/${IE_PACKAGE_NAME_${component}}
          PERMISSIONS ${IE_PACKAGE_FILE_PERMISSIONS} COMPONENT ${component})
endforeach()
install(FILES ${IE_PACKAGE_FILES_DIR}/editor-svc-demo.1.gz DESTINATION ${CMAKE_INSTALL_MANDIR}/man1
        PERMISSIONS ${IE_PACKAGE_FILE_PERMISSIONS} COMPONENT demo)

set(CPACK_GENERATOR DEB)
set(CPACK_DEB_COMPONENT_INSTALL ON)
set(CPACK_COMPONENTS_ALL ${IE_PACKAGE_COMPONENTS})
set(CPACK_PACKAGE_NAME editor-svc)
set(CPACK_PACKAGE_VERSION ${PROJECT_VERSION})
set(CPACK_PACKAGING_INSTALL_PREFIX ${CMAKE_INSTALL_PREFIX})
set(CPACK_STRIP_FILES ON)
set(CPACK_DEBIAN_FILE_NAME DEB-DEFAULT)
set(CPACK_DEBIAN_PACKAGE_SOURCE editor-svc)
set(CPACK_DEBIAN_PACKAGE_MAINTAINER "${IE_PACKAGE_MAINTAINER}")
set(CPACK_DEBIAN_PACKAGE_PRIORITY optional)
set(CPACK_DEBIAN_PACKAGE_CONTROL_STRICT_PERMISSION ON)
# Packages with libraries in the loader's path refresh its cache.
set(CPACK_DEBIAN_LIBRARY_PACKAGE_CONTROL_EXTRA ${CMAKE_SOURCE_DIR}/packaging/triggers)
set(CPACK_DEBIAN_PLATFORM_PACKAGE_CONTROL_EXTRA ${CMAKE_SOURCE_DIR}/packaging/triggers)

# Dependencies on Debian's packages come from the binaries themselves. Our
# own libraries are found in the build tree (no Debian package owns them);
# the dependencies between our packages are declared below.
set(CPACK_DEBIAN_PACKAGE_SHLIBDEPS ON)
# Hosts built against our libraries get their dependencies the same way.
set(CPACK_DEBIAN_PACKAGE_GENERATE_SHLIBS ON)
set(CPACK_DEBIAN_PACKAGE_GENERATE_SHLIBS_POLICY ">=")
get_property(ie_platform_libraries GLOBAL PROPERTY IE_PLATFORM_LIBRARIES)
set(CPACK_DEBIAN_PACKAGE_SHLIBDEPS_PRIVATE_DIRS)
foreach(target editor-svc photoeditoreffects PhotoEditorEngine ${ie_platform_libraries})
  get_target_property(dir ${target} BINARY_DIR)
  list(APPEND CPACK_DEBIAN_PACKAGE_SHLIBDEPS_PRIVATE_DIRS ${dir})
endforeach()

set(ie_version "${PROJECT_VERSION}")
set(ie_platform_depends "${IE_PACKAGE_NAME_platform} (= ${ie_version}) | ${IE_PLATFORM_VIRTUAL_PACKAGE}")

foreach(component ${IE_PACKAGE_COMPONENTS})
  string(TOUPPER ${component} COMPONENT)
  set(CPACK_DEBIAN_${COMPONENT}_PACKAGE_NAME ${IE_PACKAGE_NAME_${component}})
endforeach()

set(CPACK_DEBIAN_LIBRARY_PACKAGE_SECTION libs)
set(CPACK_DEBIAN_LIBRARY_PACKAGE_DEPENDS "${ie_platform_depends}")
set(CPACK_COMPONENT_LIBRARY_DESCRIPTION "in-place picture editor for a photo viewer
A shared library that gives a photo viewer an editor for the picture it
shows: crop, rotate left and right, twenty effects with an adjustable
intensity, pinch and double-tap zoom. Done writes the edited picture as a
new JPEG beside the source and registers it in the media database; the
source picture is never changed.
.
This package holds the library, the effect libraries it loads and its
theme, tables, images and translations.")

set(CPACK_DEBIAN_DEV_PACKAGE_SECTION libdevel)
set(CPACK_DEBIAN_DEV_PACKAGE_DEPENDS "${IE_PACKAGE_NAME_library} (= ${ie_version}), libefl-all-dev")
set(CPACK_DEBIAN_DEV_PACKAGE_SHLIBDEPS OFF)
set(CPACK_COMPONENT_DEV_DESCRIPTION "in-place picture editor for a photo viewer - development files
A shared library that gives a photo viewer an editor for the picture it
shows: crop, rotate, effects and zoom, saving the result as a new JPEG.
.
This package holds the header and the pkg-config file (editor-svc) a host
builds against.")

set(CPACK_DEBIAN_PLATFORM_PACKAGE_SECTION libs)
set(CPACK_DEBIAN_PLATFORM_PACKAGE_PROVIDES ${IE_PLATFORM_VIRTUAL_PACKAGE})
set(CPACK_COMPONENT_PLATFORM_DESCRIPTION "platform services for the editor-svc picture editor
The services the picture editor calls on its platform - log, window of the
hosted gadget, theme tables, bundles, application launch, storage size,
media database and usage log - as small shared libraries, for hosts that
run outside that platform. The databases are kept under
/var/lib/editor-svc-platform unless environment variables move them.")

set(CPACK_DEBIAN_DEMO_PACKAGE_SECTION graphics)
set(CPACK_DEBIAN_DEMO_PACKAGE_DEPENDS "${IE_PACKAGE_NAME_library} (= ${ie_version}), ${ie_platform_depends}")
set(CPACK_COMPONENT_DEMO_DESCRIPTION "demo photo viewer embedding the editor-svc picture editor
editor-svc-demo opens the in-place picture editor on a picture (a sample
picture by default) in a window, or headless with a script of taps on the
editor's tools and buttons, writing screenshots of the steps.")

include(CPack)
