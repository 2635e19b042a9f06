# Adapts the packages' files to Debian policy before CPack builds the packages.
file(GLOB packages ${CPACK_TEMPORARY_DIRECTORY}/*/usr)

# Make links within /usr relative.
file(GLOB links ${CPACK_TEMPORARY_DIRECTORY}/*/usr/lib/tpd-device/bin/*)
foreach(link IN LISTS links)
    file(READ_SYMLINK ${link} target)
    string(REGEX REPLACE "^/usr/" "../../../" target ${target})
    file(CREATE_LINK ${target} ${link} SYMBOLIC)
endforeach()

foreach(package IN LISTS packages)
    # Debian packages install zsh completions in vendor-completions.
    file(RENAME ${package}/share/zsh/site-functions ${package}/share/zsh/vendor-completions)
    # CPack created the directories with the caller's umask.
    execute_process(
        COMMAND find ${package} -type d -exec chmod 755 {} + COMMAND_ERROR_IS_FATAL ANY)
endforeach()
