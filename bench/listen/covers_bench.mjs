// The cover art actions of library.cgi, measured in the same run as the listing of the Bench folder
// (10,000 tracks): every album of the library with its year, track count and cover (the album grid),
// an album artist's albums with all its tracks, and the covers of 200 track rows. Each as a median
// over `rounds`, with its ratio to library.cgi's listing of the folder.
const median = (values) => [...values].sort((a, b) => a - b)[Math.floor(values.length / 2)];

export async function measureCovers({ base, auth, rounds, folderNode, listMedian }) {
  const request = async (params) => {
    const start = performance.now();
    const response = await fetch(`${new URL("webapi/library.cgi", base)}?${new URLSearchParams(params)}`, { headers: { Authorization: auth } });
    const text = await response.text();
    const reply = JSON.parse(text);
    if (!response.ok || reply.success !== true) throw new Error(`${params.action}: HTTP ${response.status} ${text.slice(0, 200)}`);
    return { ms: performance.now() - start, reply };
  };
  const folder = (await request({ action: "list", node: folderNode })).reply;
  const streams = folder.tracks.slice(0, 200).map((track) => track.stream).join(",");
  const all = (await request({ action: "albums", node: "musiclib_music_album" })).reply;
  // The artist with the most tracks among those the grid shows.
  const artists = new Map();
  for (const album of all.albums) artists.set(album.artist, (artists.get(album.artist) ?? 0) + album.tracks);
  const [artist, artistTracks] = [...artists].sort((a, b) => b[1] - a[1])[0];
  const artistNode = `musiclib_artist:${[...new TextEncoder().encode(artist)]
    .map((byte) => (/[A-Za-z0-9._~-]/.test(String.fromCharCode(byte)) ? String.fromCharCode(byte) : `%${byte.toString(16).toUpperCase().padStart(2, "0")}`))
    .join("")}`;
  const times = { albums: [], artist: [], covers: [] };
  for (let i = 0; i < rounds; i++) {
    times.albums.push((await request({ action: "albums", node: "musiclib_music_album" })).ms);
    times.artist.push((await request({ action: "albums", node: artistNode })).ms);
    times.covers.push((await request({ action: "covers", streams })).ms);
  }
  const line = (name, values) =>
    `${name.padEnd(44)} median ${median(values).toFixed(1).padStart(7)} ms  min ${Math.min(...values).toFixed(1).padStart(7)} ms  ` +
    `x${(median(values) / listMedian).toFixed(2)} of library.cgi list`;
  return [
    line(`library.cgi albums, all ${all.albums.length}`, times.albums),
    line(`library.cgi albums of an artist (${artistTracks} tracks)`, times.artist),
    line("library.cgi covers of 200 rows", times.covers),
  ];
}
