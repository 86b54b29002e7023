<?xml version="1.0" encoding="UTF-8"?>
<CAL-DATA xmlns="http://kest.dev/schemas/cdf/1.0" xmlns:xsi="http://www.w3.org/2001/XMLSchema-instance" xsi:schemaLocation="http://kest.dev/schemas/cdf/1.0 cdf.xsd">
  <!-- Base calibration of a 1.6 l gasoline engine: idle, torque and diagnostics. -->
  <CHANGE-HISTORY>
    <CHANGE>
      <USERNAME>mkoehler</USERNAME>
      <DATE>2024-03-11T09:42:17</DATE>
      <TOOL>calmorph 0.1</TOOL>
      <NOTE>Initial base calibration from the dyno campaign</NOTE>
      <DATA-VERSION>BASE_01.00</DATA-VERSION>
    </CHANGE>
    <CHANGE>
      <USERNAME>sbrandt</USERNAME>
      <DATE>2024-04-02T16:05:48</DATE>
      <TOOL>calmorph 0.1</TOOL>
      <NOTE>Cold idle raised by 50 rpm after winter tests</NOTE>
      <DATA-VERSION>BASE_01.01</DATA-VERSION>
    </CHANGE>
  </CHANGE-HISTORY>
  <FILENAME>EC16_base.cdf</FILENAME>
  <COMPANY-INFO>Kest Automotive Engineering</COMPANY-INFO>
  <NOTE>Released for vehicle tests, not for series production.</NOTE>
  <CAL-LIST>
    <NAME>EngineControl</NAME>
    <SYMBOLIC-FILE crc32="0x3A5F19C2">EC16_V0412.a2l</SYMBOLIC-FILE>
    <TARGET-IMAGE crc32="0x9B04E7D1">EC16_V0412.hex</TARGET-IMAGE>
    <NOTE>Idle speed and torque limitation</NOTE>
    <CAL-ITEM>
      <NAME>IdleSpeedTarget</NAME>
      <AXIS size="5" sw-units="degC" format-type="NUMERIC">-20 0 20 40 80</AXIS>
      <VALUE sw-units-ref="rpm" format-type="NUMERIC">1200 980 850 780 760</VALUE>
      <ANNOTATION>Target idle speed over coolant temperature</ANNOTATION>
    </CAL-ITEM>
    <CAL-ITEM>
      <NAME>TorqueLimit</NAME>
      <AXIS size="4" sw-units="rpm" format-type="NUMERIC">1000 2000 4000 6000</AXIS>
      <AXIS size="3" sw-units="%" format-type="NUMERIC">20 60 100</AXIS>
      <VALUE sw-units-ref="Nm" format-type="NUMERIC">45.5 98 120.25 52 110.5 145 50.75 118 152.5 44 101 139.125</VALUE>
      <ANNOTATION>Maximum indicated torque over speed and relative load</ANNOTATION>
      <NOTE>Row major: speed outer, load inner</NOTE>
    </CAL-ITEM>
    <CAL-ITEM>
      <NAME>KnockRetardMax</NAME>
      <VALUE sw-units-ref="deg" format-type="NUMERIC">6.5</VALUE>
    </CAL-ITEM>
  </CAL-LIST>
  <CAL-LIST>
    <NAME>Diagnostics</NAME>
    <SYMBOLIC-FILE crc32="0x0000002A">DIAG_V0107.a2l</SYMBOLIC-FILE>
    <TARGET-IMAGE crc32="0xFFFFFFFF">DIAG_V0107.hex</TARGET-IMAGE>
    <CAL-ITEM>
      <NAME>FaultLampMode</NAME>
      <AXIS size="3" sw-units="-" format-type="STRING">"LOW" "MEDIUM" "HIGH"</AXIS>
      <VALUE sw-units-ref="-" format-type="STRING">"OFF" "BLINK" "ON"</VALUE>
      <NOTE>Lamp state per fault severity</NOTE>
    </CAL-ITEM>
    <CAL-ITEM>
      <NAME>DiagProtocol</NAME>
      <VALUE sw-units-ref="-" format-type="LABEL">UDS_ON_CAN</VALUE>
    </CAL-ITEM>
    <CAL-ITEM>
      <NAME>MisfireThreshold</NAME>
      <AXIS size="3" sw-units="rpm" format-type="NUMERIC">800 3000 6000</AXIS>
      <AXIS size="2" sw-units="Nm" format-type="NUMERIC">0 150</AXIS>
      <VALUE sw-units-ref="%" format-type="NUMERIC">2.5 1.8 2 1.5 1.75 1.25</VALUE>
    </CAL-ITEM>
  </CAL-LIST>
</CAL-DATA>
