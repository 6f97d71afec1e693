# The files of the contract as text within zuv-service, which hands them out. To be included before service.cmake.
#
# zuv_embed_contract(schema target_file): writes a source that defines what service/contract_files.h declares.
function(zuv_embed_contract schema target_file)
    file(GLOB_RECURSE files RELATIVE ${schema} CONFIGURE_DEPENDS ${schema}/*.xsd ${schema}/*.wsdl)
    set(rows)
    foreach(name ${files})
        set_property(DIRECTORY APPEND PROPERTY CMAKE_CONFIGURE_DEPENDS ${schema}/${name})
        file(READ ${schema}/${name} text)
        string(REPLACE "http://www.zuv.example" "${ZUV_AUTHORITY}" text "${text}")
        string(APPEND rows "    {\"${name}\", R\"contract(${text})contract\"sv},\n")
    endforeach()
    file(WRITE ${target_file}.new "// Made of schema/ by cmake/contract_files.cmake.\n#include \"contract_files.h\"\n\n"
        "namespace service {\n\nusing namespace std::string_view_literals;\n\nstatic constexpr contract_file FILES[] = {\n${rows}};\n\n"
        "std::span<const contract_file> contract_files()\n{\n    return FILES;\n}\n\n} // namespace service\n")
    file(COPY_FILE ${target_file}.new ${target_file} ONLY_IF_DIFFERENT)
    set_source_files_properties(${target_file} PROPERTIES COMPILE_OPTIONS -Wno-overlength-strings) # clang counts them
endfunction()
