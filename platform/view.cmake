# Pacing and locking, free of Qt.
add_library(qivo_platform_link STATIC DisplayLink.h FairLock.cpp FairLock.h GLContext.h RefreshPacer.cpp RefreshPacer.h
                                      ThreadDisplayLink.cpp ThreadDisplayLink.h)
target_link_libraries(qivo_platform_link PUBLIC qivo_options Threads::Threads)

# The OpenGL view and its context.
pkg_check_modules(XCB REQUIRED IMPORTED_TARGET xcb)
add_library(qivo_platform_view STATIC DrawableSize.cpp DrawableSize.h OpenGLView.cpp OpenGLView.h PixelFormat.cpp PixelFormat.h SwapInterval.cpp
                                      SwapInterval.h WindowGLContext.cpp WindowGLContext.h)
set_target_properties(qivo_platform_view PROPERTIES AUTOMOC ON)
target_link_libraries(qivo_platform_view PUBLIC qivo_platform_link Qt6::Widgets PRIVATE qivo_platform_base PkgConfig::XCB)
