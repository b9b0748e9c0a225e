#include "platform/lib/curl/Easy.h"

namespace harmona::curl {

bool StringList::Append(const char* text) {
    curl_slist* grown = curl_slist_append(head_, text);
    if (grown == nullptr)
        return false;
    head_ = grown;
    return true;
}

long Easy::ResponseCode() const {
    long code = 0;
    if (GetInfo(CURLINFO_RESPONSE_CODE, &code) != CURLE_OK)
        return 0;
    return code;
}

}  // namespace harmona::curl
