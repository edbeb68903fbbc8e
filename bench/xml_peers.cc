#include "xml_peers.h"

#include <expat.h>

#include <pugixml.hpp>
#include <stdexcept>

namespace ironmoat::bench {

std::size_t expatEvents(std::string_view xml) {
  XML_Parser parser = XML_ParserCreate(nullptr);
  std::size_t events = 0;
  XML_SetUserData(parser, &events);
  XML_SetElementHandler(
      parser,
      [](void* count, const XML_Char*, const XML_Char**) { ++*static_cast<std::size_t*>(count); },
      [](void* count, const XML_Char*) { ++*static_cast<std::size_t*>(count); });
  XML_SetCharacterDataHandler(parser, [](void* count, const XML_Char*, int length) {
    *static_cast<std::size_t*>(count) += static_cast<std::size_t>(length != 0);
  });
  const bool good = XML_Parse(parser, xml.data(), static_cast<int>(xml.size()), 1) == XML_STATUS_OK;
  XML_ParserFree(parser);
  if (!good) throw std::runtime_error("expat refuses the message");
  return events;
}

std::size_t pugixmlDom(std::string_view xml) {
  pugi::xml_document document;
  const auto result =
      document.load_buffer(xml.data(), xml.size(), pugi::parse_minimal, pugi::encoding_utf8);
  if (!result) throw std::runtime_error("pugixml refuses the message");
  return *document.document_element().name() == 'p' ? 1 : 0;
}

}  // namespace ironmoat::bench
