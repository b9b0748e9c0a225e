// The one record type of the playlist and iPod lists: a singly linked list allocated by the
// listing call and released whole by VANUPlayListFree.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>

struct PLAYLIST_INFO {
    std::uint32_t id;      // the playlist's number (shared playlists); not read for the iPod
    char szName[255];      // display name, NUL-terminated, at most 254 bytes
    char szKey[4352];      // key (iPod playlist id as 16 hex digits), at most 4351 bytes
    PLAYLIST_INFO* pNext;  // null on the last record
};

// Releases a whole list; a null head is allowed. Returns 0.
int VANUPlayListFree(PLAYLIST_INFO* head);

namespace harmona::playlist {

// Copies `text` into a field of `size` bytes, cut on a UTF-8 character boundary so that at most
// size - 1 bytes are kept, and NUL-terminates it.
void CopyUtf8Field(char* field, std::size_t size, std::string_view text);

// The most records one list may hold. A record takes 4.6 KB and its tree node about as much again,
// so this many stay far inside a request's memory bound (RequestLimits.h); no real playlist
// collection comes near it.
inline constexpr std::size_t kMaxPlaylistRecords = 10000;

// Builds a list in order: append records, then Release() hands the head to the caller (who frees it
// with VANUPlayListFree); a builder that is destroyed unreleased frees what it holds.
class PlaylistListBuilder {
  public:
    explicit PlaylistListBuilder(std::size_t maxRecords = kMaxPlaylistRecords)
        : maxRecords_(maxRecords) {}
    ~PlaylistListBuilder() { VANUPlayListFree(head_); }
    PlaylistListBuilder(const PlaylistListBuilder&) = delete;
    PlaylistListBuilder& operator=(const PlaylistListBuilder&) = delete;

    // Appends one record; returns false when memory ran out or the list already holds maxRecords
    // (then Full() is true: the caller refuses the listing with LogListTooLong); the list so far
    // stays valid.
    bool Append(std::uint32_t id, std::string_view name, std::string_view key);

    bool Full() const { return count_ >= maxRecords_; }

    PLAYLIST_INFO* Release() {
        PLAYLIST_INFO* head = head_;
        head_ = nullptr;
        tail_ = nullptr;
        return head;
    }

  private:
    std::size_t maxRecords_;
    std::size_t count_ = 0;
    PLAYLIST_INFO* head_ = nullptr;
    PLAYLIST_INFO* tail_ = nullptr;
};

// Logs that a listing was refused because it holds more than `maxRecords` entries; `what` names
// the list ("playlists in /usr/vanu/etc/preference/anna/playlists").
void LogListTooLong(const std::string& what, std::size_t maxRecords);

}  // namespace harmona::playlist
