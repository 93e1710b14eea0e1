# The GL kit reads its shaders when it runs, so they lie in the resource directory of the build tree, too.
set(shaders Quad2D.vs Quad2D.fs QuadRect.vs QuadRect.fs)
set(shader_copies "")
foreach(shader ${shaders})
    set(copy ${CMAKE_BINARY_DIR}/share/qivo-viewer/${shader})
    add_custom_command(OUTPUT ${copy} COMMAND ${CMAKE_COMMAND} -E copy ${CMAKE_CURRENT_SOURCE_DIR}/${shader} ${copy}
                       DEPENDS ${CMAKE_CURRENT_SOURCE_DIR}/${shader} VERBATIM)
    list(APPEND shader_copies ${copy})
endforeach()
add_custom_target(qivo_shaders ALL DEPENDS ${shader_copies})
install(FILES ${shaders} DESTINATION share/qivo-viewer)
