# What controls on a window ask of the platform.
pkg_check_modules(XCB REQUIRED IMPORTED_TARGET xcb)
add_library(qivo_platform_controls STATIC KeyState.cpp KeyState.h PointerState.cpp PointerState.h SymbolIcon.cpp SymbolIcon.h
                                          TrackingArea.cpp TrackingArea.h)
target_link_libraries(qivo_platform_controls PUBLIC qivo_options Qt6::Widgets PRIVATE PkgConfig::XCB)
set_target_properties(qivo_platform_controls PROPERTIES AUTOMOC ON)
