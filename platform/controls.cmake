# What controls on a window ask of the platform.
add_library(qivo_platform_controls STATIC PointerState.cpp PointerState.h SymbolIcon.cpp SymbolIcon.h TrackingArea.cpp
                                          TrackingArea.h)
target_link_libraries(qivo_platform_controls PUBLIC qivo_options Qt6::Widgets)
set_target_properties(qivo_platform_controls PROPERTIES AUTOMOC ON)
