<HEADER_INFO><Sensor><Doppler><VectorDouble NumberOfElements="-3"><ValueDouble>1</ValueDouble></VectorDouble></Doppler>
<Codes><VectorOfStructs_Codes NumberOfElements="1" NumberOfFields="2"><VectorOfStructsValues_Codes ID="0"><A>1</A><B>2</B></VectorOfStructsValues_Codes></VectorOfStructs_Codes></Codes>
<Pos><Struct_Pos NumberOfFields="2"><Lat>NaN</Lat><Lon>-1e308</Lon></Struct_Pos></Pos></Sensor></HEADER_INFO>
