// The navigation's words (the breadcrumb's name for assistive technology), one dictionary per
// language code; labels.js merges them into LABELS.
export const NAV_WORDS = {
  enu: { navBreadcrumb: "Location" },
  ger: { navBreadcrumb: "Pfad" },
  fre: { navBreadcrumb: "Emplacement" },
  spn: { navBreadcrumb: "Ubicación" },
  ita: { navBreadcrumb: "Posizione" },
  jpn: { navBreadcrumb: "現在の場所" },
  chs: { navBreadcrumb: "当前位置" },
  cht: { navBreadcrumb: "目前位置" },
};
