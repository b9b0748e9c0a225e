// HTML encoding of display texts.
#pragma once

#include <string>

class WebUtils {
  public:
    // & < > " ' become &amp; &lt; &gt; &quot; &#39;; nothing else changes. The flag has no effect.
    static std::string EncodeHtml(const std::string& text, bool flag);
};
