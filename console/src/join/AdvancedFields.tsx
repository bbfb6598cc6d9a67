import { Checkbox } from '@patternfly/react-core/dist/esm/components/Checkbox';
import { FormGroup, FormHelperText } from '@patternfly/react-core/dist/esm/components/Form';
import { HelperText, HelperTextItem } from '@patternfly/react-core/dist/esm/components/HelperText';
import { Radio } from '@patternfly/react-core/dist/esm/components/Radio';
import type { NetworkInterface } from '../api/types';
import { t } from '../texts';
import { TextField } from '../ui';
import type { FieldsProps } from './JoinFields';
import { problemText } from './problemText';

interface AdvancedFieldsProps extends FieldsProps {
  // The appliance's own; undefined while they are not known.
  interfaces: NetworkInterface[] | undefined;
}

// Options that are found by themselves as a rule.
export function AdvancedFields(props: AdvancedFieldsProps) {
  const { form, onChange, problems, insist } = props;
  return (
    <>
      <TextField
        id="join-kdc"
        label={t('join.kdc')}
        hint={t('join.kdc.hint')}
        value={form.kdc}
        onChange={(kdc) => onChange({ kdc })}
        problem={problemText(problems.kdc)}
        insist={insist}
      />
      <TextField
        id="join-netbios"
        label={t('join.netbios')}
        hint={t('join.netbios.hint')}
        value={form.netbios}
        onChange={(netbios) => onChange({ netbios })}
        problem={problemText(problems.netbios)}
        insist={insist}
      />
      <TextField
        id="join-fqdn"
        label={t('join.fqdn')}
        hint={t('join.fqdn.hint')}
        value={form.fqdn}
        onChange={(fqdn) => onChange({ fqdn })}
        problem={problemText(problems.fqdn)}
        insist={insist}
      />
      <Interfaces {...props} />
    </>
  );
}

function Interfaces({ form, onChange, problems, insist, interfaces }: AdvancedFieldsProps) {
  const chosen = form.nics;
  // One that was chosen earlier stays in the list even when it is gone: it can be taken out then.
  const known: NetworkInterface[] = interfaces ?? [];
  const missing = (chosen ?? []).filter((name) => !known.some((item) => item.name === name));
  const all = [...known, ...missing.map((name) => ({ name, addresses: [] }))];
  const toggle = (name: string, checked: boolean) =>
    onChange({
      nics: all.map((item) => item.name).filter((item) => (item === name ? checked : chosen?.includes(item))),
    });
  const complaint = insist ? problemText(problems.nics) : null;

  return (
    <FormGroup role="radiogroup" fieldId="join-nics" label={t('join.nics')} hasNoPaddingTop isStack>
      <Radio
        id="join-nics-all"
        name="join-nics"
        label={t('join.nics.all')}
        isChecked={chosen === null}
        onChange={() => onChange({ nics: null })}
      />
      <Radio
        id="join-nics"
        name="join-nics"
        label={t('join.nics.some')}
        isChecked={chosen !== null}
        isDisabled={all.length === 0}
        onChange={() => onChange({ nics: [] })}
        body={
          chosen !== null && (
            <div className="vorn-nics">
              {all.map((item) => (
                <Checkbox
                  key={item.name}
                  id={`join-nic-${item.name}`}
                  label={item.name}
                  description={item.addresses.join(', ')}
                  isChecked={chosen.includes(item.name)}
                  onChange={(_event, checked) => toggle(item.name, checked)}
                />
              ))}
            </div>
          )
        }
      />
      <FormHelperText aria-live="polite">
        <HelperText>
          {complaint !== null && <HelperTextItem variant="error">{complaint}</HelperTextItem>}
          {all.length === 0 && <HelperTextItem>{t('join.nics.unknown')}</HelperTextItem>}
        </HelperText>
      </FormHelperText>
    </FormGroup>
  );
}
