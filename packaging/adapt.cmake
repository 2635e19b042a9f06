# Adapts the files of the packages to Debian's rules before CPack builds the packages.
file(GLOB packages ${CPACK_TEMPORARY_DIRECTORY}/*/usr)

# Links within /usr are relative.
file(GLOB links ${CPACK_TEMPORARY_DIRECTORY}/*/usr/lib/tpd-device/bin/*)
foreach(link IN LISTS links)
    file(READ_SYMLINK ${link} target)
    string(REGEX REPLACE "^/usr/" "../../../" target ${target})
    file(CREATE_LINK ${target} ${link} SYMBOLIC)
endforeach()

foreach(package IN LISTS packages)
    # Packages have a directory of their own for zsh.
    file(RENAME ${package}/share/zsh/site-functions ${package}/share/zsh/vendor-completions)
    # Directories were made with the caller's umask.
    execute_process(
        COMMAND find ${package} -type d -exec chmod 755 {} + COMMAND_ERROR_IS_FATAL ANY)
endforeach()
