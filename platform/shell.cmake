# What the application's shell asks of the platform.
pkg_check_modules(SYSTEMD REQUIRED IMPORTED_TARGET libsystemd)
add_library(
    qivo_platform_shell STATIC
    Activity.cpp Activity.h Application.cpp Application.h Preferences.cpp Preferences.h StartUp.cpp StartUp.h
    TerminationSignals.cpp TerminationSignals.h UrlOpener.cpp UrlOpener.h)
target_link_libraries(qivo_platform_shell PUBLIC qivo_options Qt6::Core Qt6::Gui Qt6::Widgets
                                          PRIVATE qivo_platform_base PkgConfig::SYSTEMD Threads::Threads)
set_target_properties(qivo_platform_shell PROPERTIES AUTOMOC ON)
