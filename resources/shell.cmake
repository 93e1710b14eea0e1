# The pages that the application opens in a browser lie in the resource directory of the build tree, too.
set(pages home.html qivo.html page.css)
set(page_copies "")
foreach(page ${pages})
    set(copy ${CMAKE_BINARY_DIR}/share/qivo-viewer/pages/${page})
    add_custom_command(OUTPUT ${copy}
                       COMMAND ${CMAKE_COMMAND} -E copy ${CMAKE_CURRENT_SOURCE_DIR}/pages/${page} ${copy}
                       DEPENDS ${CMAKE_CURRENT_SOURCE_DIR}/pages/${page} VERBATIM)
    list(APPEND page_copies ${copy})
    install(FILES pages/${page} DESTINATION share/qivo-viewer/pages)
endforeach()
add_custom_target(qivo_pages ALL DEPENDS ${page_copies})

install(FILES qivo-viewer.desktop DESTINATION ${CMAKE_INSTALL_DATADIR}/applications)
install(FILES icons/qivo-viewer.svg DESTINATION ${CMAKE_INSTALL_DATADIR}/icons/hicolor/scalable/apps)
install(FILES icons/qivo-viewer.png DESTINATION ${CMAKE_INSTALL_DATADIR}/icons/hicolor/128x128/apps)
