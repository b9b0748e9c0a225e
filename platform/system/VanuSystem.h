// Configuration, shares, services and small text helpers of the platform.
#pragma once

#include <cstddef>

// Looks `key` up in audio.conf (keys outside any section). On a non-empty value copies it into
// `buffer` cut to size - 1 bytes and returns the full value's length (> 0); 0 when the key is
// absent or empty (a missing file counts as empty); -1 for a null key or buffer, a size below 1, or
// an unreadable file.
int VANUAudioConfGet(const char* key, char* buffer, int size);

// Nonzero when the audio share (audio_share_path of audio.conf, else /volume1/music) is a
// directory.
int VANUAudioHasShare();

// For n from 1 to 64: 1 when /run/vanu/service/<n>.pid holds the decimal pid of a running process,
// 0 when the file is missing, empty or names no running process; -1 for any other n.
int VANUServiceStatusGet(int service);

// Nonzero when stat(path) succeeds.
int CORXFileExist(const char* path);

// Removes leading and trailing white space of `text` in place; negative for a null text.
int CORXStrTrimSpace(char* text, int option);
