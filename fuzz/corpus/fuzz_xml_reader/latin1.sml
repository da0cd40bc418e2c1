<?xml version="1.0" ?>
<HEADER_INFO>
   <RasterInfo>
      <GeocodedImage>été … Ã  &#233; &lt;</GeocodedImage>
      <OtherInfo>
         <MatrixString NumberOfRows = "1" NumberOfColumns = "2">
            <MatrixRowString ID = "0">
               <ValueString ID = "0">SOFTWARE</ValueString>
               <ValueString ID = "1">&quot;&quot;</ValueString>
            </MatrixRowString>
         </MatrixString>
      </OtherInfo>
   </RasterInfo>
</HEADER_INFO>
