qivo_test(test-platform-base SOURCES LogTest.cpp ResourcesTest.cpp LocalFileTest.cpp LIBRARIES qivo_platform_base TSAN)
if(TARGET test-platform-base)
    add_dependencies(test-platform-base qivo_shaders)
endif()
qivo_test(test-platform-image SOURCES ImageTest.cpp ImageDecodingTest.cpp LIBRARIES qivo_platform_image Qt6::Gui)
if(TARGET test-platform-image)
    set_target_properties(test-platform-image PROPERTIES AUTOMOC ON)
    target_compile_definitions(test-platform-image PRIVATE QT_STATICPLUGIN) # one of the test's own
endif()
