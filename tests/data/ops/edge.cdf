<?xml version="1.0" encoding="UTF-8"?>
<CAL-DATA xmlns="http://kest.dev/schemas/cdf/1.0" xmlns:xsi="http://www.w3.org/2001/XMLSchema-instance" xsi:schemaLocation="http://kest.dev/schemas/cdf/1.0 cdf.xsd">
  <!-- Values at the edges of the JSON and CSV forms: element kinds, quoting, layouts. -->
  <CHANGE-HISTORY>
    <CHANGE>
      <USERNAME>Jörg "JJ" Müller</USERNAME>
      <DATE>2300-12-31T23:59:59</DATE>
    </CHANGE>
  </CHANGE-HISTORY>
  <FILENAME>edge.cdf</FILENAME>
  <NOTE>Line one
line two, with "quotes" &amp; a tab:	end \ backslash</NOTE>
  <CAL-LIST>
    <NAME>Edge,List</NAME>
    <SYMBOLIC-FILE crc32="0xFFFFFFFF">edge.a2l</SYMBOLIC-FILE>
    <CAL-ITEM>
      <NAME>ScalarInt</NAME>
      <VALUE sw-units-ref="-" format-type="NUMERIC">42</VALUE>
    </CAL-ITEM>
    <CAL-ITEM>
      <NAME>Zündwinkel</NAME>
      <AXIS size="3" sw-units="°C" format-type="NUMERIC">1 2.5 3</AXIS>
      <VALUE sw-units-ref="°KW" format-type="NUMERIC">1 2 3.5</VALUE>
      <ANNOTATION></ANNOTATION>
    </CAL-ITEM>
    <CAL-ITEM>
      <NAME>Cube</NAME>
      <AXIS size="2" sw-units="a" format-type="NUMERIC">0 1</AXIS>
      <AXIS size="2" sw-units="b" format-type="NUMERIC">10 20</AXIS>
      <AXIS size="2" sw-units="c" format-type="NUMERIC">100 200</AXIS>
      <VALUE sw-units-ref="x" format-type="NUMERIC">0 1 2 3 4 5 6 7</VALUE>
    </CAL-ITEM>
    <CAL-ITEM>
      <NAME>CountMismatch</NAME>
      <AXIS size="4" sw-units="rpm" format-type="NUMERIC">1000 2000 3000</AXIS>
      <VALUE sw-units-ref="Nm" format-type="NUMERIC">5.5 6</VALUE>
    </CAL-ITEM>
    <CAL-ITEM>
      <NAME>Spaces</NAME>
      <VALUE sw-units-ref="-" format-type="NUMERIC"> 1  2 </VALUE>
    </CAL-ITEM>
    <CAL-ITEM>
      <NAME>Doubles</NAME>
      <VALUE sw-units-ref="-" format-type="NUMERIC">1.0e-005 2.5e+300 -0.0 -464.0 0.1 -2147483648</VALUE>
    </CAL-ITEM>
    <CAL-ITEM>
      <NAME>Words</NAME>
      <AXIS size="2" sw-units="-" format-type="STRING">"low, cold" "high"</AXIS>
      <VALUE sw-units-ref="in &quot;q&quot;" format-type="STRING">"a,b" "c d"</VALUE>
      <NOTE>strings with commas &lt;and&gt; quotes</NOTE>
    </CAL-ITEM>
    <CAL-ITEM>
      <NAME>Mode</NAME>
      <VALUE sw-units-ref="" format-type="LABEL">UDS ON CAN</VALUE>
    </CAL-ITEM>
  </CAL-LIST>
  <CAL-LIST>
    <NAME>Second</NAME>
    <SYMBOLIC-FILE crc32="0x00000000"></SYMBOLIC-FILE>
    <TARGET-IMAGE crc32="0x0000002A">t.hex</TARGET-IMAGE>
    <NOTE></NOTE>
  </CAL-LIST>
</CAL-DATA>
