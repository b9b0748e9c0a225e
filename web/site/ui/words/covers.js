// The cover art's words (the album grid), one dictionary per language code; labels.js merges them
// into LABELS.
export const COVER_WORDS = {
  enu: { coverAlbums: "Albums", coverTrackCount: "{count} tracks", coverTrackCountOne: "{count} track" },
  ger: { coverAlbums: "Alben", coverTrackCount: "{count} Titel", coverTrackCountOne: "{count} Titel" },
  fre: { coverAlbums: "Albums", coverTrackCount: "{count} pistes", coverTrackCountOne: "{count} piste" },
  spn: { coverAlbums: "Álbumes", coverTrackCount: "{count} pistas", coverTrackCountOne: "{count} pista" },
  ita: { coverAlbums: "Album", coverTrackCount: "{count} brani", coverTrackCountOne: "{count} brano" },
  jpn: { coverAlbums: "アルバム", coverTrackCount: "{count} 曲", coverTrackCountOne: "{count} 曲" },
  chs: { coverAlbums: "专辑", coverTrackCount: "{count} 首曲目", coverTrackCountOne: "{count} 首曲目" },
  cht: { coverAlbums: "專輯", coverTrackCount: "{count} 首曲目", coverTrackCountOne: "{count} 首曲目" },
};
