qivo_test(test-platform-surface SOURCES SurfaceTest.cpp SurfaceSocket.h LIBRARIES qivo_platform_surface TSAN)
