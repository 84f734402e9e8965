# The page's static texts become a source file of the library.
set(page_web ${CMAKE_CURRENT_SOURCE_DIR}/page/web)
set(page_plot ${PROJECT_SOURCE_DIR}/third_party/uplot)
set(page_assets ${CMAKE_CURRENT_BINARY_DIR}/page_assets.cpp)
file(GLOB page_texts CONFIGURE_DEPENDS ${page_web}/* ${page_plot}/*)
add_custom_command(
  OUTPUT ${page_assets}
  COMMAND ${CMAKE_COMMAND} -DSOURCE=${page_web} -DPLOT=${page_plot} -DTARGET=${page_assets}
          -P ${CMAKE_CURRENT_SOURCE_DIR}/page/bundle.cmake
  DEPENDS ${page_texts} ${CMAKE_CURRENT_SOURCE_DIR}/page/bundle.cmake
  VERBATIM)
target_sources(report PRIVATE ${page_assets})
