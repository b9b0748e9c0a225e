#include "platform/playlist/PlaylistRecord.h"

#include <syslog.h>

#include <cstdlib>
#include <cstring>

#include "common/util/Utf8.h"

int VANUPlayListFree(PLAYLIST_INFO* head) {
    while (head != nullptr) {
        PLAYLIST_INFO* next = head->pNext;
        std::free(head);
        head = next;
    }
    return 0;
}

namespace harmona::playlist {

void CopyUtf8Field(char* field, std::size_t size, std::string_view text) {
    if (size == 0)
        return;
    const std::size_t length = util::CutUtf8(text, size - 1).size();
    if (length > 0)  // an empty view may have a null data(), which memcpy must not get
        std::memcpy(field, text.data(), length);
    field[length] = '\0';
}

void LogListTooLong(const std::string& what, std::size_t maxRecords) {
    syslog(LOG_ERR, "playlist list: more than %zu %s; the listing is refused", maxRecords,
           what.c_str());
}

bool PlaylistListBuilder::Append(std::uint32_t id, std::string_view name, std::string_view key) {
    if (Full())
        return false;
    // Not zero-filled: a record is 4.6 KB of which a listing reads two short NUL-terminated texts,
    // and clearing a thousand of them cost a thousand page faults and most of a root request's
    // time (bench/roottree). Every field that is read is written here.
    auto* record = static_cast<PLAYLIST_INFO*>(std::malloc(sizeof(PLAYLIST_INFO)));
    if (record == nullptr)
        return false;
    record->id = id;
    record->pNext = nullptr;
    CopyUtf8Field(record->szName, sizeof(record->szName), name);
    CopyUtf8Field(record->szKey, sizeof(record->szKey), key);
    if (tail_ == nullptr)
        head_ = record;
    else
        tail_->pNext = record;
    tail_ = record;
    ++count_;
    return true;
}

}  // namespace harmona::playlist
