<?xml version="1.0" encoding="UTF-8"?>
<CAL-DATA xmlns="http://kest.dev/schemas/cdf/1.0"
          xmlns:xsi="http://www.w3.org/2001/XMLSchema-instance"
          xsi:schemaLocation="http://kest.dev/schemas/cdf/1.0 cdf.xsd">
  <!-- indented by hand -->
  <CHANGE-HISTORY/>
  <FILENAME>calibration.cdf</FILENAME>
  <CAL-LIST>
    <NAME>Gearbox</NAME>
    <SYMBOLIC-FILE crc32="0x8000000a">gearbox.a2l</SYMBOLIC-FILE>
    <CAL-ITEM>
      <NAME>SHIFT_POINT</NAME>
      <VALUE sw-units-ref="rpm" format-type="NUMERIC">2500</VALUE>
    </CAL-ITEM>
  </CAL-LIST>
</CAL-DATA>
