qivo_test(test-platform-shell SOURCES PreferencesTest.cpp TerminationSignalsTest.cpp UrlOpenerTest.cpp
          LIBRARIES qivo_platform_shell qivo_platform_base)
qivo_test(test-platform-activity SOURCES ActivityTest.cpp LIBRARIES qivo_platform_shell Qt6::DBus)
if(TARGET test-platform-activity)
    set_target_properties(test-platform-activity PROPERTIES AUTOMOC ON)
endif()
