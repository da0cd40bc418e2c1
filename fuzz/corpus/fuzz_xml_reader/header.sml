<?xml version="1.0" ?>
<HEADER_INFO xmlns="http://www.tellurix.org/schemas/header"
	xmlns:xsi="http://www.w3.org/2001/XMLSchema-instance"
	xsi:schemaLocation="http://www.tellurix.org/schemas/header
	http://www.tellurix.org/schemas/header/TellurixHeaderSchema_version_1.0.xsd">
   <Sensor>
      <Name>A&amp;B &lt;x&gt; &quot;q&quot; &apos;a&apos;</Name>
      <Lines>512</Lines>
      <Doppler>
         <VectorDouble NumberOfElements = "2">
            <ValueDouble ID = "0">0.100000000000000005551115123126</ValueDouble>
            <ValueDouble ID = "1">NaN</ValueDouble>
         </VectorDouble>
      </Doppler>
      <Labels>
         <VectorString NumberOfElements = "2">
            <ValueString ID = "0">x</ValueString>
            <ValueString ID = "1">&quot;&quot;</ValueString>
         </VectorString>
      </Labels>
      <Grid>
         <MatrixDouble NumberOfRows = "1" NumberOfColumns = "2">
            <MatrixRowDouble ID = "0">
               <ValueDouble ID = "0">1.0000000000000000525047602552e+300</ValueDouble>
               <ValueDouble ID = "1">6378137</ValueDouble>
            </MatrixRowDouble>
         </MatrixDouble>
      </Grid>
      <Orbit>
         <VectorOfStructs_Orbit NumberOfElements = "2" NumberOfFields = "3">
            <VectorOfStructsValues_Orbit ID = "0">
               <T>0</T>
               <X>1.5</X>
               <Y>-1</Y>
            </VectorOfStructsValues_Orbit>
            <VectorOfStructsValues_Orbit ID = "1">
               <T>1</T>
               <X>2.5</X>
               <Y>-2</Y>
            </VectorOfStructsValues_Orbit>
         </VectorOfStructs_Orbit>
      </Orbit>
      <Pos>
         <Struct_Pos NumberOfFields = "2">
            <Lat>45.5</Lat>
            <Lon>-7.25</Lon>
         </Struct_Pos>
      </Pos>
   </Sensor>
</HEADER_INFO>
