// The search box's words, one dictionary per language code; labels.js merges them into LABELS.
export const SEARCH_WORDS = {
  enu: {
    searchLabel: "Search the music library", searchPlaceholder: "Search tracks, albums, artists",
    searchResults: "Search results", searchTracks: "Tracks", searchAlbums: "Albums", searchArtists: "Artists",
    searchTrackCount: "{count} tracks", searchTrackCountOne: "{count} track", searchAlbumCount: "{count} albums", searchAlbumCountOne: "{count} album", searchNone: "Nothing found.",
    searchMore: "More results: type more words to narrow the search.",
    searchTooLong: "The search is too long: use at most 8 words and 200 characters.",
  },
  ger: {
    searchLabel: "Musikbibliothek durchsuchen", searchPlaceholder: "Titel, Alben, Interpreten suchen",
    searchResults: "Suchergebnisse", searchTracks: "Titel", searchAlbums: "Alben", searchArtists: "Interpreten",
    searchTrackCount: "{count} Titel", searchTrackCountOne: "{count} Titel", searchAlbumCount: "{count} Alben", searchAlbumCountOne: "{count} Album", searchNone: "Nichts gefunden.",
    searchMore: "Weitere Treffer: Geben Sie mehr Wörter ein, um die Suche einzugrenzen.",
    searchTooLong: "Die Suche ist zu lang: höchstens 8 Wörter und 200 Zeichen.",
  },
  fre: {
    searchLabel: "Rechercher dans la bibliothèque musicale", searchPlaceholder: "Rechercher titres, albums, artistes",
    searchResults: "Résultats de la recherche", searchTracks: "Titres", searchAlbums: "Albums", searchArtists: "Artistes",
    searchTrackCount: "{count} titres", searchTrackCountOne: "{count} titre", searchAlbumCount: "{count} albums", searchAlbumCountOne: "{count} album", searchNone: "Aucun résultat.",
    searchMore: "D'autres résultats existent : saisissez plus de mots pour affiner la recherche.",
    searchTooLong: "La recherche est trop longue : 8 mots et 200 caractères au plus.",
  },
  spn: {
    searchLabel: "Buscar en la biblioteca de música", searchPlaceholder: "Buscar pistas, álbumes, artistas",
    searchResults: "Resultados de la búsqueda", searchTracks: "Pistas", searchAlbums: "Álbumes", searchArtists: "Artistas",
    searchTrackCount: "{count} pistas", searchTrackCountOne: "{count} pista", searchAlbumCount: "{count} álbumes", searchAlbumCountOne: "{count} álbum", searchNone: "No se encontró nada.",
    searchMore: "Hay más resultados: escriba más palabras para acotar la búsqueda.",
    searchTooLong: "La búsqueda es demasiado larga: como máximo 8 palabras y 200 caracteres.",
  },
  ita: {
    searchLabel: "Cerca nella libreria musicale", searchPlaceholder: "Cerca brani, album, artisti",
    searchResults: "Risultati della ricerca", searchTracks: "Brani", searchAlbums: "Album", searchArtists: "Artisti",
    searchTrackCount: "{count} brani", searchTrackCountOne: "{count} brano", searchAlbumCount: "{count} album", searchAlbumCountOne: "{count} album", searchNone: "Nessun risultato.",
    searchMore: "Ci sono altri risultati: digita altre parole per restringere la ricerca.",
    searchTooLong: "La ricerca è troppo lunga: al massimo 8 parole e 200 caratteri.",
  },
  jpn: {
    searchLabel: "ミュージックライブラリを検索", searchPlaceholder: "曲、アルバム、アーティストを検索",
    searchResults: "検索結果", searchTracks: "曲", searchAlbums: "アルバム", searchArtists: "アーティスト",
    searchTrackCount: "{count} 曲", searchTrackCountOne: "{count} 曲", searchAlbumCount: "{count} 枚のアルバム", searchAlbumCountOne: "{count} 枚のアルバム", searchNone: "見つかりませんでした。",
    searchMore: "ほかにも結果があります。語を追加して絞り込んでください。",
    searchTooLong: "検索語が長すぎます。8 語、200 文字までにしてください。",
  },
  chs: {
    searchLabel: "搜索音乐库", searchPlaceholder: "搜索曲目、专辑、艺术家",
    searchResults: "搜索结果", searchTracks: "曲目", searchAlbums: "专辑", searchArtists: "艺术家",
    searchTrackCount: "{count} 首曲目", searchTrackCountOne: "{count} 首曲目", searchAlbumCount: "{count} 张专辑", searchAlbumCountOne: "{count} 张专辑", searchNone: "未找到任何内容。",
    searchMore: "还有更多结果：请输入更多字词以缩小搜索范围。",
    searchTooLong: "搜索内容过长：最多 8 个词、200 个字符。",
  },
  cht: {
    searchLabel: "搜尋音樂庫", searchPlaceholder: "搜尋曲目、專輯、演出者",
    searchResults: "搜尋結果", searchTracks: "曲目", searchAlbums: "專輯", searchArtists: "演出者",
    searchTrackCount: "{count} 首曲目", searchTrackCountOne: "{count} 首曲目", searchAlbumCount: "{count} 張專輯", searchAlbumCountOne: "{count} 張專輯", searchNone: "找不到任何內容。",
    searchMore: "還有更多結果：請輸入更多字詞以縮小搜尋範圍。",
    searchTooLong: "搜尋內容過長：最多 8 個詞、200 個字元。",
  },
};
