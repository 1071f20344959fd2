{ Pascal values to inspect: static, dynamic and open arrays, the string
  kinds, a record, a class, a set and an enumeration. }
program pasvalues;
{$mode objfpc}{$H+}

type
  TColour = (Red, Green, Blue);
  TColours = set of TColour;
  TPair = record
    Left, Right: LongInt;
  end;
  TShape = class
    Sides: LongInt;
    Title: AnsiString;
  end;

var
  Fixed: array[1..5] of LongInt;
  Growing: array of LongInt;
  Short: ShortString;
  Ansi: AnsiString;
  Wide: UnicodeString;
  Pair: TPair;
  Shape: TShape;
  Colours: TColours;
  Colour: TColour;

function Total(const Items: array of LongInt): LongInt;
var
  Index: LongInt;
begin
  Result := 0;
  for Index := Low(Items) to High(Items) do
    Result := Result + Items[Index]; { line:total-body }
end;

var
  Index: LongInt;
begin
  for Index := 1 to 5 do
    Fixed[Index] := Index * 11;
  SetLength(Growing, 3);
  Growing[0] := 7;
  Growing[1] := 8;
  Growing[2] := 9;
  Short := 'short text';
  Ansi := 'ansi text';
  Wide := 'wide text';
  Pair.Left := 1;
  Pair.Right := 2;
  Shape := TShape.Create;
  Shape.Sides := 4;
  Shape.Title := 'square';
  Colours := [Red, Blue];
  Colour := Green;
  WriteLn(Total(Fixed), ' ', Length(Growing), ' ', Short, Ansi, Wide);
  Shape.Free;
end.
