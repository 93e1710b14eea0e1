qivo_test(test-platform-task SOURCES TaskTest.cpp LIBRARIES qivo_platform_task TSAN)
