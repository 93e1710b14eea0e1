#include "runtime/SoapMessage.h"

#include "runtime/GstHandles.h"

namespace qivo::runtime {

std::string envelope(const SoapMessage& message, std::string_view header) {
    std::string text = "<?xml version=\"1.0\" encoding=\"UTF-8\"?>"
                       "<s:Envelope xmlns:s=\"http://www.w3.org/2003/05/soap-envelope\""
                       " xmlns:tds=\"http://www.onvif.org/ver10/device/wsdl\""
                       " xmlns:trt=\"http://www.onvif.org/ver10/media/wsdl\""
                       " xmlns:tptz=\"http://www.onvif.org/ver20/ptz/wsdl\""
                       " xmlns:timg=\"http://www.onvif.org/ver20/imaging/wsdl\""
                       " xmlns:tt=\"http://www.onvif.org/ver10/schema\">";
    if (!header.empty()) {
        text.append("<s:Header>").append(header).append("</s:Header>");
    }
    return text + "<s:Body>" + message.body + "</s:Body></s:Envelope>";
}

std::string xmlText(std::string_view text) {
    const GstOwned<gchar> valid(g_utf8_make_valid(text.data(), static_cast<gssize>(text.size())));
    std::string kept;
    for (const char* at = valid.get(); *at != '\0'; ++at) {
        if (static_cast<unsigned char>(*at) >= 0x20 || *at == '\t') {
            kept += *at;
        }
    }
    const GstOwned<gchar> escaped(g_markup_escape_text(kept.c_str(), -1));
    return escaped.get();
}

} // namespace qivo::runtime
