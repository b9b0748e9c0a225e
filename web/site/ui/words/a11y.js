// The words of the track list's column headers and of the language picker, one dictionary per
// language code; labels.js merges them into LABELS.
export const A11Y_WORDS = {
  enu: {
    trackList: "Tracks", colNumber: "No.", colTitle: "Title", colArtist: "Artist", colAlbum: "Album", colDuration: "Duration",
    language: "Language", languageAuto: "Browser language",
    languageUnwritable: "Your language could not be saved. Please try again later.",
  },
  ger: {
    trackList: "Titel", colNumber: "Nr.", colTitle: "Titel", colArtist: "Interpret", colAlbum: "Album", colDuration: "Dauer",
    language: "Sprache", languageAuto: "Sprache des Browsers",
    languageUnwritable: "Ihre Sprache konnte nicht gespeichert werden. Bitte versuchen Sie es später erneut.",
  },
  fre: {
    trackList: "Pistes", colNumber: "N°", colTitle: "Titre", colArtist: "Artiste", colAlbum: "Album", colDuration: "Durée",
    language: "Langue", languageAuto: "Langue du navigateur",
    languageUnwritable: "Votre langue n'a pas pu être enregistrée. Veuillez réessayer plus tard.",
  },
  spn: {
    trackList: "Pistas", colNumber: "N.º", colTitle: "Título", colArtist: "Artista", colAlbum: "Álbum", colDuration: "Duración",
    language: "Idioma", languageAuto: "Idioma del navegador",
    languageUnwritable: "No se ha podido guardar su idioma. Inténtelo de nuevo más tarde.",
  },
  ita: {
    trackList: "Brani", colNumber: "N.", colTitle: "Titolo", colArtist: "Artista", colAlbum: "Album", colDuration: "Durata",
    language: "Lingua", languageAuto: "Lingua del browser",
    languageUnwritable: "Non è stato possibile salvare la lingua. Riprovare più tardi.",
  },
  jpn: {
    trackList: "トラック", colNumber: "番号", colTitle: "タイトル", colArtist: "アーティスト", colAlbum: "アルバム", colDuration: "時間",
    language: "言語", languageAuto: "ブラウザーの言語",
    languageUnwritable: "言語を保存できませんでした。しばらくしてからもう一度お試しください。",
  },
  chs: {
    trackList: "曲目", colNumber: "序号", colTitle: "标题", colArtist: "艺术家", colAlbum: "专辑", colDuration: "时长",
    language: "语言", languageAuto: "浏览器语言",
    languageUnwritable: "无法保存您的语言。请稍后重试。",
  },
  cht: {
    trackList: "曲目", colNumber: "序號", colTitle: "標題", colArtist: "演出者", colAlbum: "專輯", colDuration: "長度",
    language: "語言", languageAuto: "瀏覽器語言",
    languageUnwritable: "無法儲存您的語言。請稍後再試。",
  },
};

// Each language's name in that language, as the picker lists it (the same in every UI language).
export const LANGUAGE_NAMES = {
  enu: "English", ger: "Deutsch", fre: "Français", spn: "Español", ita: "Italiano", jpn: "日本語", chs: "简体中文", cht: "繁體中文",
};
