# Threads and programs that run beside this one, free of Qt.
add_library(qivo_platform_task STATIC CancellableThread.h FileDescriptor.h Task.cpp Task.h)
target_link_libraries(qivo_platform_task PUBLIC qivo_options Threads::Threads)
