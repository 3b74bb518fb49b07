# Joins a page and the files that it names into a source with two texts: what precedes the page's
# data, and what follows. Arguments: PAGE, OUTPUT.
get_filename_component(folder ${PAGE} DIRECTORY)
file(READ ${PAGE} page)

# Puts a named file in place of each element of the page that matches.
function(embed pattern before after)
  string(REGEX MATCHALL "${pattern}" elements "${page}")
  foreach(element IN LISTS elements)
    string(REGEX MATCH "[a-z]+\\.(css|js)" name "${element}")
    file(READ ${folder}/${name} text)
    string(REPLACE "${element}" "${before}\n${text}${after}" page "${page}")
  endforeach()
  set(page "${page}" PARENT_SCOPE)
endfunction()

embed("<link rel=\"stylesheet\" href=\"[a-z]+\\.css\">" "<style>" "</style>")
embed("<script src=\"[a-z]+\\.js\"></script>" "<script>" "</script>")

set(data "{\"files\": [], \"pools\": []}")
string(FIND "${page}" "${data}" begin)
if(begin EQUAL -1)
  message(FATAL_ERROR "${PAGE} has no place for its data: ${data}")
endif()
string(LENGTH "${data}" length)
math(EXPR end "${begin} + ${length}")
string(SUBSTRING "${page}" 0 ${begin} start)
string(SUBSTRING "${page}" ${end} -1 rest)

file(WRITE ${OUTPUT} "// Made from ${PAGE}.
#include \"picture/Data.h\"

namespace VOK::MemPool::Tools {

const std::string_view pageStart = R\"page(${start})page\";
const std::string_view pageEnd = R\"page(${rest})page\";

} // namespace VOK::MemPool::Tools
")
