# Read by CPack before it makes each kind of package.
set(CPACK_COMPONENT_INCLUDE_TOPLEVEL_DIRECTORY OFF)
if(CPACK_GENERATOR STREQUAL "TGZ") # the others install below /usr
  set(CPACK_COMPONENT_INCLUDE_TOPLEVEL_DIRECTORY ON)
endif()

# The time that goes into the packages themselves.
if(NOT DEFINED ENV{SOURCE_DATE_EPOCH})
  set(ENV{SOURCE_DATE_EPOCH} ${CPACK_RELEASE_TIME})
endif()
