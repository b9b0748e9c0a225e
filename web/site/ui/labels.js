// The page's own words (the node texts come from the server; the server's error texts from
// texts.json, generated from data/texts/ at build time). Keyed by the platform's language codes.
import { FAILURE_WORDS } from "./words/failures.js";
import { PLAYLIST_WORDS } from "./words/playlists.js";
import { RADIO_WORDS } from "./words/radio.js";
import { COVER_WORDS } from "./words/covers.js";
import { NAV_WORDS } from "./words/nav.js";
import { QUEUE_WORDS } from "./words/queue.js";
import { SEARCH_WORDS } from "./words/search.js";
import { A11Y_WORDS } from "./words/a11y.js";
export const LABELS = {
  enu: {
    title: "Harmona Audio", tree: "Audio sources", rerandom: "New Random 100",
    rerandomDone: "A new Random 100 playlist was drawn.", loading: "Loading…", empty: "(empty)",
    refreshed: "Updated.", hint: "Select an item in the tree.",
    sessionExpired: "Your login is no longer valid. Reload the page to log in again.",
    noReply: "The server did not answer this request (HTTP {status}).", badReply: "The server sent a reply that cannot be read.",
    unknownError: "Error {sec} / {key}", offline: "The server cannot be reached.",
    playAll: "Play all", play: "Play", pause: "Pause", next: "Next", previous: "Previous",
    seek: "Position", volume: "Volume", trackCount: "{count} tracks", trackCountOne: "{count} track", cannotPlay: "This track cannot be played.",
  },
  ger: {
    title: "Harmona Audio", tree: "Audioquellen", rerandom: "Neue Zufalls-100",
    rerandomDone: "Eine neue Zufalls-100-Wiedergabeliste wurde erstellt.", loading: "Wird geladen…", empty: "(leer)",
    refreshed: "Aktualisiert.", hint: "Wählen Sie einen Eintrag im Baum.",
    sessionExpired: "Ihre Anmeldung ist nicht mehr gültig. Laden Sie die Seite neu, um sich anzumelden.",
    noReply: "Der Server hat diese Anfrage nicht beantwortet (HTTP {status}).", badReply: "Die Antwort des Servers ist nicht lesbar.",
    unknownError: "Fehler {sec} / {key}", offline: "Der Server ist nicht erreichbar.",
    playAll: "Alle abspielen", play: "Abspielen", pause: "Pause", next: "Weiter", previous: "Zurück",
    seek: "Position", volume: "Lautstärke", trackCount: "{count} Titel", trackCountOne: "{count} Titel", cannotPlay: "Dieser Titel kann nicht abgespielt werden.",
  },
  fre: {
    title: "Harmona Audio", tree: "Sources audio", rerandom: "Nouveau Aléatoire 100",
    rerandomDone: "Une nouvelle liste Aléatoire 100 a été tirée.", loading: "Chargement…", empty: "(vide)",
    refreshed: "Mis à jour.", hint: "Sélectionnez un élément de l'arborescence.",
    sessionExpired: "Votre connexion n'est plus valide. Rechargez la page pour vous reconnecter.",
    noReply: "Le serveur n'a pas répondu à cette requête (HTTP {status}).", badReply: "La réponse du serveur est illisible.",
    unknownError: "Erreur {sec} / {key}", offline: "Le serveur est injoignable.",
    playAll: "Tout lire", play: "Lire", pause: "Pause", next: "Suivant", previous: "Précédent",
    seek: "Position", volume: "Volume", trackCount: "{count} pistes", trackCountOne: "{count} piste", cannotPlay: "Cette piste ne peut pas être lue.",
  },
  spn: {
    title: "Harmona Audio", tree: "Fuentes de audio", rerandom: "Nuevo Aleatorio 100",
    rerandomDone: "Se ha creado una nueva lista Aleatorio 100.", loading: "Cargando…", empty: "(vacío)",
    refreshed: "Actualizado.", hint: "Seleccione un elemento del árbol.",
    sessionExpired: "Su sesión ya no es válida. Vuelva a cargar la página para iniciar sesión.",
    noReply: "El servidor no respondió a esta solicitud (HTTP {status}).", badReply: "La respuesta del servidor no se puede leer.",
    unknownError: "Error {sec} / {key}", offline: "No se puede contactar con el servidor.",
    playAll: "Reproducir todo", play: "Reproducir", pause: "Pausa", next: "Siguiente", previous: "Anterior",
    seek: "Posición", volume: "Volumen", trackCount: "{count} pistas", trackCountOne: "{count} pista", cannotPlay: "Esta pista no se puede reproducir.",
  },
  ita: {
    title: "Harmona Audio", tree: "Sorgenti audio", rerandom: "Nuova Casuale 100",
    rerandomDone: "È stata creata una nuova playlist Casuale 100.", loading: "Caricamento…", empty: "(vuoto)",
    refreshed: "Aggiornato.", hint: "Selezionare un elemento dell'albero.",
    sessionExpired: "L'accesso non è più valido. Ricaricare la pagina per accedere di nuovo.",
    noReply: "Il server non ha risposto a questa richiesta (HTTP {status}).", badReply: "La risposta del server non è leggibile.",
    unknownError: "Errore {sec} / {key}", offline: "Il server non è raggiungibile.",
    playAll: "Riproduci tutto", play: "Riproduci", pause: "Pausa", next: "Successivo", previous: "Precedente",
    seek: "Posizione", volume: "Volume", trackCount: "{count} brani", trackCountOne: "{count} brano", cannotPlay: "Questo brano non può essere riprodotto.",
  },
  jpn: {
    title: "Harmona オーディオ", tree: "オーディオソース", rerandom: "ランダム 100 を再作成",
    rerandomDone: "新しいランダム 100 プレイリストを作成しました。", loading: "読み込み中…", empty: "(空)",
    refreshed: "更新しました。", hint: "ツリーから項目を選択してください。",
    sessionExpired: "ログインが無効になりました。ページを再読み込みしてログインしてください。",
    noReply: "サーバーがこの要求に応答しませんでした (HTTP {status})。", badReply: "サーバーの応答を読み取れません。",
    unknownError: "エラー {sec} / {key}", offline: "サーバーに接続できません。",
    playAll: "すべて再生", play: "再生", pause: "一時停止", next: "次へ", previous: "前へ",
    seek: "再生位置", volume: "音量", trackCount: "{count} 曲", trackCountOne: "{count} 曲", cannotPlay: "このトラックは再生できません。",
  },
  chs: {
    title: "Harmona 音频", tree: "音频来源", rerandom: "重新生成随机 100",
    rerandomDone: "已生成新的随机 100 播放列表。", loading: "正在加载…", empty: "(空)",
    refreshed: "已更新。", hint: "请在树中选择一个项目。",
    sessionExpired: "您的登录已失效。请重新加载页面以登录。",
    noReply: "服务器未响应此请求 (HTTP {status})。", badReply: "无法读取服务器的响应。",
    unknownError: "错误 {sec} / {key}", offline: "无法连接服务器。",
    playAll: "全部播放", play: "播放", pause: "暂停", next: "下一首", previous: "上一首",
    seek: "播放位置", volume: "音量", trackCount: "{count} 首", trackCountOne: "{count} 首", cannotPlay: "无法播放此曲目。",
  },
  cht: {
    title: "Harmona 音訊", tree: "音訊來源", rerandom: "重新產生隨機 100",
    rerandomDone: "已產生新的隨機 100 播放清單。", loading: "正在載入…", empty: "(空)",
    refreshed: "已更新。", hint: "請在樹狀結構中選擇一個項目。",
    sessionExpired: "您的登入已失效。請重新載入頁面以登入。",
    noReply: "伺服器未回應此要求 (HTTP {status})。", badReply: "無法讀取伺服器的回應。",
    unknownError: "錯誤 {sec} / {key}", offline: "無法連線至伺服器。",
    playAll: "全部播放", play: "播放", pause: "暫停", next: "下一首", previous: "上一首",
    seek: "播放位置", volume: "音量", trackCount: "{count} 首", trackCountOne: "{count} 首", cannotPlay: "無法播放此曲目。",
  },
};

// Each feature's own words (words/*.js), one dictionary per language code, merged in.
for (const words of [FAILURE_WORDS, PLAYLIST_WORDS, RADIO_WORDS, COVER_WORDS, NAV_WORDS, QUEUE_WORDS, SEARCH_WORDS, A11Y_WORDS])
  for (const [code, dictionary] of Object.entries(words)) LABELS[code] = { ...LABELS[code], ...dictionary };

// The page's BCP 47 tag for a language code (the html lang attribute).
export const HTML_LANG = { enu: "en", ger: "de", fre: "fr", spn: "es", ita: "it", jpn: "ja", chs: "zh-Hans", cht: "zh-Hant" };
