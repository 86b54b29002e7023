<?xml version="1.0" encoding="UTF-8"?>
<CAL-DATA xmlns="http://kest.dev/schemas/cdf/1.0" xmlns:xsi="http://www.w3.org/2001/XMLSchema-instance" xsi:schemaLocation="http://kest.dev/schemas/cdf/1.0 cdf.xsd">
  <!-- Report edges: hostile names, non-finite values, odd axes, one changed map cell. -->
  <CHANGE-HISTORY>
    <CHANGE>
      <USERNAME>J&amp;ouml;rg &lt;jm&gt;</USERNAME>
      <DATE>2024-05-01T10:00:00</DATE>
    </CHANGE>
  </CHANGE-HISTORY>
  <FILENAME>old.cdf</FILENAME>
  <NOTE>&lt;/script&gt;&lt;b id="inj"&gt;bold&lt;/b&gt; &amp; "q" Grüße</NOTE>
  <CAL-LIST>
    <NAME>L&lt;1&gt;</NAME>
    <SYMBOLIC-FILE crc32="0xCBF43926">ref.a2l</SYMBOLIC-FILE>
    <TARGET-IMAGE crc32="0x00000001">ref.a2l</TARGET-IMAGE>
    <CAL-ITEM>
      <NAME>&lt;/script&gt;&lt;img src=x onerror=alert(1)&gt;&amp;"Kurve"</NAME>
      <AXIS size="5" sw-units="rpm" format-type="NUMERIC">1000 2000 3000 4000 5000</AXIS>
      <VALUE sw-units-ref="Nm" format-type="NUMERIC">1 2 2.5 4 5</VALUE>
    </CAL-ITEM>
    <CAL-ITEM>
      <NAME>Map</NAME>
      <AXIS size="3" sw-units="rpm" format-type="NUMERIC">1000 2000 3000</AXIS>
      <AXIS size="4" sw-units="load" format-type="NUMERIC">10 20 30 40</AXIS>
      <VALUE sw-units-ref="Nm" format-type="NUMERIC">0 1 2 3 4 5 6 7 8 9 10 11</VALUE>
    </CAL-ITEM>
    <CAL-ITEM>
      <NAME>Descending</NAME>
      <AXIS size="4" sw-units="degC" format-type="NUMERIC">80 40 40 0</AXIS>
      <VALUE sw-units-ref="Nm" format-type="NUMERIC">1 nan inf 4</VALUE>
    </CAL-ITEM>
    <CAL-ITEM>
      <NAME>OnePoint</NAME>
      <AXIS size="1" sw-units="a" format-type="NUMERIC">5</AXIS>
      <AXIS size="1" sw-units="b" format-type="NUMERIC">7</AXIS>
      <VALUE sw-units-ref="Nm" format-type="NUMERIC">3</VALUE>
    </CAL-ITEM>
    <CAL-ITEM>
      <NAME>Removed</NAME>
      <VALUE sw-units-ref="Nm" format-type="NUMERIC">2</VALUE>
    </CAL-ITEM>
  </CAL-LIST>
</CAL-DATA>
